#include "services/kovaelasticd/store/packed_fields.h"

#include <algorithm>

#include "common/json_util.h"

namespace ferrox::engine {

namespace {

using Tag = PackedFields::Tag;

void PutNumber(std::string& out, uint64_t value) {
  for (; value >= 0x80; value >>= 7) out += static_cast<char>(value | 0x80);
  out += static_cast<char>(value);
}

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
    const int64_t number = value.asInt64();
    PutNumber(out, (static_cast<uint64_t>(number) << 1) ^ static_cast<uint64_t>(number >> 63));
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
  uint64_t value = 0;
  for (int shift = 0; at_ < packed_.size() && shift < 64; shift += 7) {
    const auto byte = static_cast<unsigned char>(packed_[at_++]);
    value |= static_cast<uint64_t>(byte & 0x7F) << shift;
    if (byte < 0x80) break;
  }
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
    const uint64_t coded = ReadNumber();
    int_ = static_cast<int64_t>(coded >> 1) ^ -static_cast<int64_t>(coded & 1);
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
