#include "services/kovaelasticd/store/packed_fields.h"

#include <algorithm>

#include "common/json_util.h"
#include "services/kovaelasticd/store/packed_numbers.h"

namespace ferrox::engine {

namespace {

using Tag = PackedFields::Tag;

void PutText(std::string& out, Tag tag, const std::string& text) {
  out += static_cast<char>(tag);
  PutNumber(out, text.size());
  out += text;
}

void PutValue(std::string& out, const Json::Value& value) {
  if (value.isNull()) {
    out += static_cast<char>(Tag::kNull);
  } else if (value.isBool()) {
    out += static_cast<char>(value.asBool() ? Tag::kTrue : Tag::kFalse);
  } else if (value.isInt64() && value.type() != Json::realValue) {
    out += static_cast<char>(Tag::kInt);
    PutSigned(out, value.asInt64());
  } else if (value.isString()) {
    PutText(out, Tag::kText, value.asString());
  } else {
    PutText(out, Tag::kJson, toString(value));
  }
}

}  // namespace

void AddField(std::string& packed, int64_t number, const Json::Value& value) {
  PutNumber(packed, static_cast<uint64_t>(number));
  PutValue(packed, value);
}

void ReplaceField(std::string& packed, int64_t number, const Json::Value& value) {
  PackedFields fields(packed);
  while (fields.Next()) {
    if (fields.Number() != number) continue;
    std::string field;
    AddField(field, number, value);
    packed.replace(fields.Begin(), fields.End() - fields.Begin(), field);
    return;
  }
  AddField(packed, number, value);
}

std::optional<std::string_view> TextField(std::string_view packed, int64_t number) {
  for (PackedFields fields(packed); fields.Next();) {
    if (fields.Number() == number) return fields.IsText() ? std::optional(fields.Text()) : std::nullopt;
  }
  return std::nullopt;
}

uint64_t PackedFields::ReadNumber() {
  std::string_view rest = packed_.substr(at_);
  uint64_t value = 0;
  (void)CutNumber(rest, value);
  at_ = packed_.size() - rest.size();
  return value;
}

bool PackedFields::Next() {
  if (at_ >= packed_.size()) return false;
  begin_ = at_;
  number_ = static_cast<int64_t>(ReadNumber());
  tag_ = Tag::kNull;
  if (at_ >= packed_.size()) return true;
  tag_ = static_cast<Tag>(packed_[at_++]);
  if (tag_ == Tag::kInt) {
    int_ = Unzigzag(ReadNumber());
  } else if (tag_ == Tag::kText || tag_ == Tag::kJson) {
    const uint64_t size = ReadNumber();
    text_ = packed_.substr(at_, static_cast<size_t>(std::min<uint64_t>(size, packed_.size() - at_)));
    at_ += text_.size();
  }
  return true;
}

Json::Value PackedFields::Value() const {
  switch (tag_) {
    case Tag::kInt:
      return Json::Int64(int_);
    case Tag::kText:
      return {text_.data(), text_.data() + text_.size()};
    case Tag::kJson: {
      Json::Value value;
      (void)fromString(value, std::string(text_));
      return value;
    }
    case Tag::kNull:
      return {};
    default:
      return tag_ == Tag::kTrue;
  }
}

}  // namespace ferrox::engine
