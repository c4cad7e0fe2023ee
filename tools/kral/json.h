// A JSON value: built by the verbs, written by output.cpp. What it has is named as in standard containers.
#ifndef KRAL_TOOLS_JSON_H
#define KRAL_TOOLS_JSON_H

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

namespace kral::tool {

class Json {
 public:
  struct Member;

  Json();  // null
  Json(bool value);
  Json(int value) : Json(static_cast<long long>(value)) {}
  Json(unsigned value) : Json(static_cast<unsigned long long>(value)) {}
  Json(long value) : Json(static_cast<long long>(value)) {}
  Json(unsigned long value) : Json(static_cast<unsigned long long>(value)) {}
  Json(long long value);
  Json(unsigned long long value);
  Json(double value);
  Json(const char* text) : Json(std::string_view(text)) {}
  Json(std::string_view text);
  Json(const std::string& text) : Json(std::string_view(text)) {}
  Json(const std::vector<std::uint16_t>& numbers);
  Json(std::initializer_list<Member> members);  // an object: {{"port", 7}, {"mode", "online"}}
  template <class Other>
  Json(const Other* pointer) = delete;  // it would be true
  Json(const Json& other);
  Json(Json&& other) noexcept;
  Json& operator=(const Json& other);
  Json& operator=(Json&& other) noexcept;
  ~Json();

  // What the library gives as JSON.
  static Json parsed(std::string_view text);
  static Json array();
  static Json object();

  std::size_t size() const;
  bool empty() const { return size() == 0; }

  // Of an array.
  void push_back(Json element);
  Json& back();
  Json& operator[](std::size_t index);
  // Of an object, whose members keep their order; one that is not there is added, as null.
  Json& operator[](std::string_view name);
  void update(const Json& object);  // takes over its members

  // On one line, in ASCII but for valid UTF-8; invalid bytes are replaced.
  std::string dump() const;

 private:
  enum class Kind { kNull, kBool, kSigned, kUnsigned, kDouble, kText, kArray, kObject };
  struct Entry;
  struct Writer;

  Kind kind_ = Kind::kNull;
  union {
    bool bool_;
    std::int64_t signed_;
    std::uint64_t unsigned_ = 0;
    double double_;
  };
  std::string text_;
  std::vector<Entry> entries_;  // of an array without names
};

struct Json::Member {
  std::string_view name;
  Json value;
};

}  // namespace kral::tool

#endif
