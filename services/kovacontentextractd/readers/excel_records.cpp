#include "services/kovacontentextractd/readers/excel_records.h"

#include <algorithm>

#include "services/kovacontentextractd/readers/code_pages.h"
#include "services/kovacontentextractd/readers/little_endian.h"

namespace ferrox::extract {

bool ExcelRecords::Next() {
  std::string header(4, '\0');
  if (stream_.Read(header.data(), 4) != 4) return false;
  type_ = Little16(header, 0);
  content_.resize(Little16(header, 2));
  content_.resize(stream_.Read(content_.data(), content_.size()));
  return true;
}

bool ExcelSharedTexts::Add() {
  at_ = 8;
  const uint32_t count = Little32(records_.Content(), 4);
  for (uint32_t i = 0; i < count && in_table_; ++i) {
    if (!AddText()) return false;
  }
  while (in_table_) NextRecord();
  return !ended_;
}

void ExcelSharedTexts::NextRecord() {
  ended_ = !records_.Next();
  in_table_ = !ended_ && records_.Type() == ExcelRecords::kContinue;
  at_ = 0;
}

/// A number that no record cuts.
uint32_t ExcelSharedTexts::Number(size_t size) {
  if (at_ >= records_.Content().size()) NextRecord();
  if (!in_table_) return 0;
  const auto value = static_cast<uint32_t>(LittleEndian(records_.Content(), at_, size));
  at_ += size;
  return value;
}

bool ExcelSharedTexts::AddText() {
  const uint32_t length = Number(2);
  uint32_t flags = Number(1);
  const uint32_t runs = (flags & 8) != 0 ? Number(2) : 0;
  const uint32_t extra = (flags & 4) != 0 ? Number(4) : 0;
  bool more = true;
  for (uint32_t left = length; left > 0 && in_table_;) {
    if (at_ >= records_.Content().size()) {
      NextRecord();
      if (!in_table_) break;
      flags = Number(1);
    }
    const size_t width = (flags & 1) != 0 ? 2 : 1;
    const std::string_view rest = records_.Content().substr(std::min(at_, records_.Content().size()));
    const auto count = static_cast<uint32_t>(std::min<size_t>(left, rest.size() / width));
    if (count == 0) at_ = records_.Content().size();
    const std::string_view bytes = rest.substr(0, count * width);
    more = findings_.AddText(width == 2 ? FromUtf16Little(bytes) : FromCodePage(bytes, 1252));
    at_ += bytes.size();
    left -= count;
  }
  findings_.Break();
  Skip(uint64_t{runs} * 4 + extra);
  return more;
}

void ExcelSharedTexts::Skip(uint64_t count) {
  while (count > 0 && in_table_) {
    const uint64_t left = records_.Content().size() - std::min(at_, records_.Content().size());
    if (left >= count) {
      at_ += static_cast<size_t>(count);
      return;
    }
    count -= left;
    NextRecord();
  }
}

}  // namespace ferrox::extract
