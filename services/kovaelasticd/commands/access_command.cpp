#include "base/access_record.h"
#include "base/file_stamp.h"
#include "common/log.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/members.h"

namespace ferrox::engine {

namespace {

constexpr size_t kRecordsMax = 10000;

AccessChange ReadRecord(const Json::Value& record) {
  AccessChange change{CheckedPath("path", RequiredText(record, "path")), RequiredText(record, "stamp"),
                      RequiredText(record, "access")};
  if (!base::FileStamp::Parse(change.stamp).has_value())
    RefuseMember("stamp", "a text like 5.1718000000.1718000000.77");
  return change;
}

std::vector<AccessChange> ReadRecords(const Json::Value& records) {
  if (!records.isArray() || records.size() > kRecordsMax)
    RefuseMember("records", "an array of at most " + std::to_string(kRecordsMax) + " objects");
  std::vector<AccessChange> changes;
  changes.reserve(records.size());
  for (const Json::Value& record : records) {
    try {
      AccessChange change = ReadRecord(record);
      const bool known = !changes.empty() && changes.back().access == change.access;
      if (!known && !base::ParseAccess(change.access).has_value()) RefuseMember("access", base::kAccessSpelling);
      changes.push_back(std::move(change));
    } catch (const Error& error) {
      throw Error(Error::kEngineBadRequest,
                  "\"records\", position " + std::to_string(changes.size()) + ": " + error.what());
    }
  }
  return changes;
}

Json::Value Positions(const std::vector<size_t>& positions) {
  Json::Value list(Json::arrayValue);
  for (const size_t position : positions) list.append(Json::UInt64(position));
  return list;
}

}  // namespace

Json::Value RunAccessSet(CommandCall& call) {
  const Registry::OpenIndex open = call.registry.Open(RequiredText(call.data, "id"));
  const std::vector<AccessChange> changes = ReadRecords(call.data["records"]);
  AccessReport report;
  open.index->Write([&](IndexStore& store) { report = store.SetAccess(changes); });
  Json::Value reply;
  reply["differing"] = Positions(report.differing);
  reply["missing"] = Positions(report.missing);
  return reply;
}

}  // namespace ferrox::engine
