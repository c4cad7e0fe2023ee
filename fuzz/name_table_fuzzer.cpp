// Any text as a table of names. What is accepted says the same when it is written down again; what is refused is told
// with its line.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "fuzz/support.h"
#include "transport/collection/name_table.h"

using namespace kral;
using fuzz::Require;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  NameTableFault fault;
  const auto table = NameTable::Parse(text, fault);
  if (!table) {
    const auto lines = static_cast<size_t>(std::ranges::count(text, '\n')) + 1;
    Require(!fault.text.empty() && fault.line >= 1 && fault.line <= lines);
    return 0;
  }
  std::string written;
  for (const NameTableRow& row : table->rows()) {
    Require(row.name.size() <= NameTable::kLongestName);
    Require(table->Find(row.id) == &row.name);  // and none stands twice
    written += std::to_string(row.id) + "," + row.name + "\n";
  }
  const auto again = NameTable::Parse(written, fault);
  Require(again && std::ranges::equal(again->rows(), table->rows(), [](const auto& left, const auto& right) {
            return left.id == right.id && left.name == right.name;
          }));
  return 0;
}
