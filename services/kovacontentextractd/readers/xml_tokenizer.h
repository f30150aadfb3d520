#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "services/kovacontentextractd/readers/xml_input.h"

namespace ferrox::extract {

/// XML piece by piece, with constant memory whatever the size of the document and of anything in it. There are no
/// document types and no entities but the five predefined ones and numbers: a document type is passed over unread, and
/// a reference to anything else is nothing. UTF-8, and UTF-16 with a mark or by its first character. What is not well
/// formed is read as far as it can be; namespaces are not resolved.
class XmlTokenizer {
 public:
  enum class Token {
    kOpen,   ///< an element begins: Name, Attribute
    kClose,  ///< it ends: Name; also behind an empty element's kOpen
    kText,   ///< a piece of text: Text; one text may come in several, none of which cuts a character
    kEnd,    ///< the end of the document, or of what can be read of it
    kBad,    ///< too deep, or not XML: nothing more comes
  };
  static constexpr int kDepthMax = 256;

  /// `source` must outlive this; it is read as tokens are asked for.
  explicit XmlTokenizer(ByteSource& source) : input_(source) {}
  XmlTokenizer(const XmlTokenizer&) = delete;
  XmlTokenizer& operator=(const XmlTokenizer&) = delete;

  /// Goes to the next token. After kEnd and kBad, the same again.
  Token Next();
  /// The same for a loop: false at the end, and where it is bad.
  bool Next(Token& token);
  /// Passes the rest of the element that was opened last, with its end.
  void SkipElement();

  /// Without its prefix. Valid, as all that follows, until the next call of Next.
  std::string_view Name() const { return LocalName(name_); }
  /// A piece of text, with references resolved.
  std::string_view Text() const { return text_; }
  /// By the whole name, with its prefix; empty when there is none.
  std::string_view Attribute(std::string_view name) const;
  /// By the name behind any prefix, but only of those that have one.
  std::string_view PrefixedAttribute(std::string_view local_name) const;
  /// How many elements are open.
  int Depth() const { return depth_; }

 private:
  struct NamedValue {
    std::string name;
    std::string value;
  };

  static std::string_view LocalName(std::string_view name);
  void SkipDocumentType();
  Token ReadText();
  Token TakeText(size_t size);
  Token ReadReference();
  Token ReadCData();
  Token ReadMarkup();
  Token ReadTag();
  Token CloseElement();
  void ReadName(std::string& name);
  void ReadAttribute();
  void ReadValue(char quote, std::string& value);
  size_t Resolve(std::string& out);
  Token Bad();

  XmlInput input_;
  bool in_cdata_ = false;       ///< within "<![CDATA[", of which the end is to come
  bool close_pending_ = false;  ///< behind an empty element
  bool bad_ = false;
  int depth_ = 0;
  std::string name_;  ///< with its prefix, of the element that begins or ends
  std::vector<NamedValue> attributes_;
  size_t attribute_count_ = 0;  ///< of attributes_: the others keep their memory
  std::string reference_;       ///< the character that text_ is, when it was a reference
  std::string_view text_;
};

}  // namespace ferrox::extract
