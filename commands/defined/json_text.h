// JSON, written piece by piece: objects and arrays, with the commas where they belong.
#ifndef KRAL_COMMANDS_DEFINED_JSON_TEXT_H
#define KRAL_COMMANDS_DEFINED_JSON_TEXT_H

#include <string>
#include <string_view>

namespace kral::defined {

class JsonText {
 public:
  JsonText& Begin(char bracket);  // '{' or '['
  JsonText& End(char bracket);
  JsonText& Name(std::string_view name);  // of the member that follows
  JsonText& Raw(std::string_view text);   // a number, true, false, null
  JsonText& Text(std::string_view text);  // in ASCII but for valid UTF-8; invalid bytes become U+FFFD
  // A member, unless it is empty.
  JsonText& Member(std::string_view name, std::string_view text);

  const std::string& text() const { return text_; }

 private:
  void Comma();
  void Quote(std::string_view text);

  std::string text_;
  bool is_first_ = true;
};

}  // namespace kral::defined

#endif
