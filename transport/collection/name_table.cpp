// Reads tables of numbers and names. A file with a mistake is refused whole: half a list of what is allowed would be
// worse than none.
#include "transport/collection/name_table.h"

#include <charconv>
#include <system_error>
#include <utility>

#include "platform/file_util.h"

namespace kral {
namespace {

constexpr std::string_view kByteOrderMark = "\xEF\xBB\xBF";
constexpr std::string_view kBlanks = " \t\r";

std::string_view Trimmed(std::string_view text) {
  const auto first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

// Reads the id in front of a line, which then begins behind it.
bool TakeId(std::string_view& line, uint16_t& id) {
  const bool hex = line.starts_with("0x") || line.starts_with("0X");
  const char* const begin = line.data() + (hex ? 2 : 0);
  const auto [end, error] = std::from_chars(begin, line.data() + line.size(), id, hex ? 16 : 10);
  if (error != std::errc()) return false;
  line.remove_prefix(static_cast<size_t>(end - line.data()));
  return true;
}

// What separates id and name: blanks, or a comma among them.
bool TakeSeparator(std::string_view& line) {
  if (line.empty()) return true;
  if (line.front() != ',' && kBlanks.find(line.front()) == std::string_view::npos) return false;
  line = Trimmed(line);
  if (line.starts_with(',')) line = Trimmed(line.substr(1));
  return true;
}

}  // namespace

std::shared_ptr<const NameTable> NameTable::Parse(std::string_view text, NameTableFault& fault) {
  auto table = std::make_shared<NameTable>();
  if (text.starts_with(kByteOrderMark)) text.remove_prefix(kByteOrderMark.size());
  const auto fail = [&fault](size_t number, const char* reason) {
    fault = {"line " + std::to_string(number) + ": " + reason, static_cast<uint32_t>(number), {}};
    return nullptr;
  };
  for (size_t number = 1; !text.empty(); ++number) {
    const size_t end = text.find('\n');
    std::string_view line = Trimmed(text.substr(0, end));
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
    if (line.empty() || line.front() == '#') continue;
    uint16_t id = 0;
    if (!TakeId(line, id) || !TakeSeparator(line)) return fail(number, "no id from 0 to 65535");
    if (line.size() > kLongestName) return fail(number, "the name is too long");
    if (line.find('\0') != std::string_view::npos) return fail(number, "not a text");
    if (!table->places_.emplace(id, table->rows_.size()).second) return fail(number, "the id stands twice");
    table->rows_.push_back({id, std::string(line)});
  }
  return table;
}

std::shared_ptr<const NameTable> NameTable::Load(const std::string& path, NameTableFault& fault) {
  std::vector<uint8_t> bytes;
  if (const auto error = ReadWholeFile(path, kLargestFile, bytes)) {
    fault = {error.message(), 0, error};
    return nullptr;
  }
  return Parse({reinterpret_cast<const char*>(bytes.data()), bytes.size()}, fault);
}

const std::string* NameTable::Find(uint16_t id) const {
  const auto found = places_.find(id);
  return found == places_.end() ? nullptr : &rows_[found->second].name;
}

NameTables::NameTables() {
  tables_.fill(std::make_shared<const NameTable>());
}

void NameTables::Set(NameTableKind kind, std::shared_ptr<const NameTable> table) {
  if (!table) table = std::make_shared<const NameTable>();
  const MutexLock lock(mutex_);
  tables_[static_cast<size_t>(kind)].swap(table);
}

std::shared_ptr<const NameTable> NameTables::Get(NameTableKind kind) const {
  const MutexLock lock(mutex_);
  return tables_[static_cast<size_t>(kind)];
}

bool NameTables::Allows(NameTableKind kind, uint16_t id) const {
  const auto table = Get(kind);
  return table->rows().empty() || table->Find(id) != nullptr;
}

}  // namespace kral
