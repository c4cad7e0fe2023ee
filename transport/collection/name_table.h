// Numbers and their names, as a user writes them into a text file: event texts, message categories, allowed lists.
#ifndef KRAL_TRANSPORT_COLLECTION_NAME_TABLE_H
#define KRAL_TRANSPORT_COLLECTION_NAME_TABLE_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <system_error>
#include <unordered_map>
#include <vector>

#include "base/mutex.h"

namespace kral {

struct NameTableRow {
  uint16_t id;
  std::string name;  // may be empty
};

// Why a table cannot be read.
struct NameTableFault {
  std::string text;
  uint32_t line = 0;  // from 1; 0 where it is the whole file's
  std::error_code system_error;
};

// One row a line: an id, decimal or hex with 0x in front, then the name, separated by blanks, a tab or a comma. Empty
// lines and lines that begin with # count for nothing. An id stands once.
class NameTable {
 public:
  static constexpr size_t kLargestFile = size_t{4} << 20;
  static constexpr size_t kLongestName = 255;

  // Null when the text cannot be read; the fault then names the line, in its text too, and what is wrong with it.
  static std::shared_ptr<const NameTable> Parse(std::string_view text, NameTableFault& fault);
  static std::shared_ptr<const NameTable> Load(const std::string& path, NameTableFault& fault);

  const std::vector<NameTableRow>& rows() const { return rows_; }  // as in the file
  const std::string* Find(uint16_t id) const;                      // null when there is no such row

 private:
  std::vector<NameTableRow> rows_;
  std::unordered_map<uint16_t, size_t> places_;
};

enum class NameTableKind : uint32_t {
  kEventTexts = 0,
  kMessageCategories = 1,
  kLogNames = 2,
  kAllowedLogs = 3,
  kAllowedEvents = 4,
};
inline constexpr size_t kNameTableCount = 5;

// The tables of one connection. Callable from any thread; a table in use outlives its replacement.
class NameTables {
 public:
  NameTables();
  void Set(NameTableKind kind, std::shared_ptr<const NameTable> table);  // null empties it
  std::shared_ptr<const NameTable> Get(NameTableKind kind) const;        // never null
  // Whether a list of what is allowed has the id. A list without rows allows everything.
  bool Allows(NameTableKind kind, uint16_t id) const;

 private:
  mutable Mutex mutex_;
  std::array<std::shared_ptr<const NameTable>, kNameTableCount> tables_ KRAL_GUARDED_BY(mutex_);
};

}  // namespace kral

#endif
