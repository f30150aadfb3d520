#include "services/kovacontentextractd/readers/pdf/xmp_packet.h"

#include "services/kovacontentextractd/readers/property_fields.h"
#include "services/kovacontentextractd/readers/xml_tokenizer.h"

namespace ferrox::extract {

namespace {

using Token = XmlTokenizer::Token;

constexpr PropertyField kFields[] = {
    {"title", field::kKOVAMDTitle},
    {"creator", field::kKOVAMDAuthors},
    {"description", field::kKOVAMDDescription},
    {"subject", field::kKOVAMDKeywords},
    {"rights", field::kKOVAMDRights},
    {"publisher", field::kKOVAMDPublishers},
    {"language", field::kKOVAMDLanguages},
};

/// A packet in memory.
class PacketSource : public ByteSource {
 public:
  explicit PacketSource(const std::string& bytes) : bytes_(bytes) {}
  size_t Read(char* buffer, size_t room) override {
    const size_t got = bytes_.copy(buffer, room, at_);
    at_ += got;
    return got;
  }

 private:
  const std::string& bytes_;
  size_t at_ = 0;
};

}  // namespace

/// A property's values are the items of a list within its element.
void AddXmpPacket(const std::string& packet, Findings& findings) {
  PacketSource source(packet);
  XmlTokenizer xml(source);
  const PropertyField* property = nullptr;
  std::string value;
  for (Token token; xml.Next(token);) {
    if (token == Token::kText) {
      if (value.size() < (32U << 10)) value += xml.Text();
      continue;
    }
    if (token == Token::kClose && xml.Name() == "li" && property != nullptr) SetProperty(*property, value, findings);
    value.clear();
    for (const PropertyField& known : kFields) {
      if (known.element == xml.Name()) property = token == Token::kOpen ? &known : nullptr;
    }
  }
}

}  // namespace ferrox::extract
