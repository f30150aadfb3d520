#pragma once

#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

namespace kova::host {

/// The text of a Samba configuration: sections "[name]" of lines "parameter = value"; lines that begin with "#" or ";"
/// are comments, a "\" at the end of another line continues it. Upper and lower case and the number of blanks do not
/// count in the names of sections, upper and lower case and blanks at all not in those of parameters. What stands
/// before the first section belongs to "global", whose values hold for the sections that begin further down and have
/// none of their own.
class SmbConf {
 public:
  explicit SmbConf(std::string text);

  const std::string& Text() const { return text_; }

  /// The names of the sections as written, with single blanks, in their order, each once.
  const std::vector<std::string>& Sections() const { return sections_; }
  bool HasSection(const std::string& section) const;

  /// The value that holds in a section; nothing when neither it nor "global" above it has one.
  std::optional<std::string> Get(const std::string& section, const std::string& parameter) const;
  /// The same with its blanks as they are written.
  std::optional<std::string> Written(const std::string& section, const std::string& parameter) const;
  bool IsOn(const std::string& section, const std::string& parameter) const;
  /// Whether a section, or "global", has a parameter whose name begins so.
  bool HasBeginning(const std::string& section, const std::string& begin) const;
  /// Each value that a parameter has anywhere.
  std::vector<std::string> All(const std::string& parameter) const;

  /// The text with a parameter of a section switched on or off, and every other byte as it was. A section in which it
  /// is so already, by its own value or by that of "global", stays as it is.
  std::string WithSwitch(const std::vector<std::string>& sections, const std::string& parameter, bool on) const;

  /// A section's name in the form in which names are compared.
  static std::string Fold(const std::string& section);
  /// yes, true, 1, on; no, false, 0, off; nothing for any other value.
  static std::optional<bool> Boolean(const std::string& value);

 private:
  /// A header, which has no name, or a parameter. Positions are in the text.
  struct Line {
    std::string section;
    std::string name;
    std::string value;
    size_t indent_begin, begin, value_begin, value_end, next;
  };

  void Parse();
  const Line* Find(const std::string& section, const std::string& parameter) const;
  size_t TakeHeader(size_t begin);
  size_t TakeParameter(size_t begin);
  size_t LogicalEnd(size_t begin) const;
  size_t FindBefore(size_t end, char wanted, size_t begin) const;
  std::string Insertion(size_t header, const std::string& parameter, bool on) const;

  std::string text_;
  std::string section_ = "global";  ///< where the next parameter belongs
  std::vector<Line> lines_;
  std::vector<std::string> sections_;
  std::unordered_map<std::string, size_t> headers_;  ///< a section's first header in lines_
  /// The lines of a parameter in a section, by section, a line feed and the parameter.
  std::unordered_map<std::string, std::vector<size_t>> values_;
};

}  // namespace kova::host
