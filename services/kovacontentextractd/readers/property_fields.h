#pragma once

#include <span>
#include <string_view>

#include "services/kovacontentextractd/readers/byte_source.h"
#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Which field an element of a document's properties fills, and how. Office Open XML, OpenDocument and EPUB all keep
/// their properties in small XML documents whose elements have a text and nothing else.
struct PropertyField {
  /// kSemicolonList: several values in one text, "A; B". kTime: see ParseTime. kCount: a number above 0.
  enum Kind { kText, kSemicolonList, kTime, kCount };

  std::string_view element;  ///< its local name
  const char* field;
  Kind kind = kText;  ///< several texts are joined
};

/// Sets the field to one value; what the kind does not take is left out.
void SetProperty(const PropertyField& property, std::string_view value, Findings& findings);

/// Reads a small XML document of properties and fills the fields that `fields` has for its elements.
void AddPropertyFields(ByteSource& source, std::span<const PropertyField> fields, Findings& findings);

}  // namespace ferrox::extract
