// Writes compound documents on Linux, with our own hands: the system's library ends the process when memory runs out.
// Version 3 of the format, with sectors of 512 bytes. Everything is measured before the file's bytes are allocated.
#include "platform/compound_file.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <optional>
#include <utility>

#include "platform/compound_format.h"

namespace kral {
namespace {

using namespace compound;

constexpr size_t kSectorSize = size_t{1} << kSmallSectors;
constexpr size_t kLongestName = kEntryNameSize / 2 - 1;  // in units of UTF-16, without the terminating zero
// Numbers in a sector of an allocation table; a list's last one leads to the next list.
constexpr size_t kNumbersInSector = kSectorSize / sizeof(uint32_t);

// Nothing for what is no UTF-8, and for names that an entry has no room for.
std::optional<std::u16string> NameUnits(std::string_view name) {
  std::u16string units;
  for (size_t at = 0; at < name.size();) {
    const auto lead = static_cast<uint8_t>(name[at]);
    const size_t length = lead < 0x80 ? 1 : lead < 0xC2 ? 0 : lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : lead < 0xF5 ? 4 : 0;
    if (length == 0 || lead == 0 || length > name.size() - at) return std::nullopt;
    uint32_t code = length == 1 ? lead : lead & (0x7Fu >> length);
    for (size_t i = 1; i < length; ++i) {
      const auto next = static_cast<uint8_t>(name[at + i]);
      if ((next & 0xC0) != 0x80) return std::nullopt;
      code = code << 6 | (next & 0x3F);
    }
    at += length;
    if (code >= 0x10000) {
      units += static_cast<char16_t>(0xD800 + ((code - 0x10000) >> 10));
      code = 0xDC00 + (code & 0x3FF);
    }
    units += static_cast<char16_t>(code);
  }
  return units.empty() || units.size() > kLongestName ? std::nullopt : std::optional(units);
}

// Siblings are sorted by length, then by their letters without case.
char16_t Upper(char16_t unit) {
  const bool is_small = (unit >= u'a' && unit <= u'z') || (unit >= 0xE0 && unit <= 0xFE && unit != 0xF7);
  return is_small ? static_cast<char16_t>(unit - 0x20) : unit;
}

bool ComesBefore(const std::u16string& a, const std::u16string& b) {
  if (a.size() != b.size()) return a.size() < b.size();
  return std::lexicographical_compare(a.begin(), a.end(), b.begin(), b.end(),
                                      [](char16_t x, char16_t y) { return Upper(x) < Upper(y); });
}

struct Entry {
  std::u16string name = {};
  EntryType type = kStorage;
  const CompoundStream* stream = nullptr;
  bool is_red = false;
  uint32_t left = kNoEntry;
  uint32_t right = kNoEntry;
  uint32_t child = kNoEntry;
  uint32_t start = 0;
  uint32_t size = 0;
};

size_t SectorsOf(size_t size, size_t sector = kSectorSize) {
  return (size + sector - 1) / sector;
}

class Writer {
 public:
  std::string Write(const CompoundStorage& root, std::vector<uint8_t>& file) {
    entries_.push_back({.name = u"Root Entry", .type = kRoot});
    if (!CollectChildren(root, 0, 0)) return problem_;
    if (!Measure()) return problem_;
    bytes_.resize(kSectorSize * (1 + sectors_));
    PlaceStreams();
    PlaceTables();
    WriteHeader();
    file = std::move(bytes_);
    return {};
  }

 private:
  // --- The directory
  // --------------------------------------------------------------------------------------------------

  bool Fail(std::string problem) {
    problem_ = std::move(problem);
    return false;
  }

  bool Add(const std::string& name, Entry entry, std::vector<uint32_t>& siblings) {
    auto units = NameUnits(name);
    if (!units) return Fail("entry " + name + " has a name that cannot be stored");
    entry.name = std::move(*units);
    siblings.push_back(static_cast<uint32_t>(entries_.size()));
    entries_.push_back(std::move(entry));
    return true;
  }

  bool CollectChildren(const CompoundStorage& storage, uint32_t parent, size_t depth) {
    if (depth > kCompoundDepthLimit) return Fail("storages nested too deeply");
    std::vector<uint32_t> siblings;
    for (const CompoundStream& stream : storage.streams) {
      if (stream.bytes.size() > kCompoundFileLimit) return Fail("too large");
      const auto size = static_cast<uint32_t>(stream.bytes.size());
      if (!Add(stream.name, {.type = kStream, .stream = &stream, .size = size}, siblings)) return false;
    }
    for (const CompoundStorage& child : storage.storages) {
      const auto number = static_cast<uint32_t>(entries_.size());
      if (!Add(child.name, {}, siblings) || !CollectChildren(child, number, depth + 1)) return false;
    }
    std::ranges::sort(siblings,
                      [this](uint32_t a, uint32_t b) { return ComesBefore(entries_[a].name, entries_[b].name); });
    size_t levels = 0;  // whole ones
    while ((size_t{2} << levels) <= siblings.size() + 1) ++levels;
    entries_[parent].child = BuildTree(siblings, levels);
    return true;
  }

  // A balanced red-black tree of sorted siblings: what hangs below the last whole level is red, all else black.
  uint32_t BuildTree(std::span<const uint32_t> siblings, size_t levels) {
    if (siblings.empty()) return kNoEntry;
    const size_t middle = siblings.size() / 2;
    const uint32_t number = siblings[middle];
    const size_t below = levels > 0 ? levels - 1 : 0;
    const uint32_t left = BuildTree(siblings.first(middle), below);
    const uint32_t right = BuildTree(siblings.subspan(middle + 1), below);
    entries_[number].is_red = levels == 0;
    entries_[number].left = left;
    entries_[number].right = right;
    return number;
  }

  // --- Sizes
  // ----------------------------------------------------------------------------------------------------------

  static bool IsShort(const Entry& entry) { return entry.size < kShortStreamBelow; }

  bool Measure() {
    for (const Entry& entry : entries_) {
      if (entry.stream == nullptr) continue;
      if (IsShort(entry)) {
        short_sectors_ += SectorsOf(entry.size, kShortSectorSize);
      } else {
        sectors_ += SectorsOf(entry.size);
      }
      if (sectors_ + short_sectors_ > kCompoundFileLimit / kShortSectorSize) return Fail("too large");
    }
    sectors_ += SectorsOf(short_sectors_ * kShortSectorSize) + SectorsOf(short_sectors_ * sizeof(uint32_t)) +
                SectorsOf(entries_.size() * kEntrySize);
    // The tables describe their own sectors, too.
    const size_t contents = sectors_;
    while (sectors_ < contents + table_sectors_ + list_sectors_ || sectors_ > table_sectors_ * kNumbersInSector) {
      table_sectors_ = SectorsOf(sectors_, kNumbersInSector);
      list_sectors_ =
          table_sectors_ <= kTablesInHeader ? 0 : SectorsOf(table_sectors_ - kTablesInHeader, kNumbersInSector - 1);
      sectors_ = contents + table_sectors_ + list_sectors_;
    }
    return sectors_ < kCompoundFileLimit / kSectorSize || Fail("too large");
  }

  // --- Sectors
  // --------------------------------------------------------------------------------------------------------

  void Put(size_t offset, uint32_t value, size_t size = sizeof(uint32_t)) {
    for (size_t i = 0; i < size; ++i) bytes_[offset + i] = static_cast<uint8_t>(value >> (8 * i));
  }
  static size_t OffsetOf(size_t sector) { return (sector + 1) * kSectorSize; }

  // The next sectors, one behind the other, with their chain; gives the first one.
  uint32_t Claim(size_t count) {
    if (count == 0) return kEndOfChain;
    const size_t first = next_.size();
    for (size_t i = 1; i < count; ++i) next_.push_back(static_cast<uint32_t>(first + i));
    next_.push_back(kEndOfChain);
    return static_cast<uint32_t>(first);
  }

  void PlaceStreams() {
    next_.reserve(sectors_);
    for (Entry& entry : entries_) {
      if (entry.stream == nullptr || IsShort(entry)) continue;
      entry.start = Claim(SectorsOf(entry.size));
      std::ranges::copy(entry.stream->bytes, bytes_.begin() + static_cast<std::ptrdiff_t>(OffsetOf(entry.start)));
    }
    PlaceShortStreams();
    directory_start_ = Claim(SectorsOf(entries_.size() * kEntrySize));
    const size_t room = SectorsOf(entries_.size() * kEntrySize) * kSectorSize / kEntrySize;
    for (size_t i = 0; i < room; ++i) {
      WriteEntry(OffsetOf(directory_start_) + i * kEntrySize, i < entries_.size() ? entries_[i] : Entry());
    }
  }

  // The content of the root holds them, with a table of its own.
  void PlaceShortStreams() {
    entries_[0].start = Claim(SectorsOf(short_sectors_ * kShortSectorSize));
    entries_[0].size = static_cast<uint32_t>(short_sectors_ * kShortSectorSize);
    short_table_sectors_ = SectorsOf(short_sectors_ * sizeof(uint32_t));
    short_table_start_ = Claim(short_table_sectors_);
    size_t sector = 0;
    for (Entry& entry : entries_) {
      if (entry.stream == nullptr || !IsShort(entry)) continue;
      entry.start = entry.size == 0 ? kEndOfChain : static_cast<uint32_t>(sector);
      std::ranges::copy(entry.stream->bytes, bytes_.begin() + static_cast<std::ptrdiff_t>(OffsetOf(entries_[0].start) +
                                                                                          sector * kShortSectorSize));
      const size_t end = sector + SectorsOf(entry.size, kShortSectorSize);
      for (; sector < end; ++sector)
        PutShort(sector, sector + 1 < end ? static_cast<uint32_t>(sector + 1) : kEndOfChain);
    }
    for (; sector < short_table_sectors_ * kNumbersInSector; ++sector) PutShort(sector, kFree);
  }
  void PutShort(size_t sector, uint32_t next) { Put(OffsetOf(short_table_start_) + sector * sizeof(uint32_t), next); }

  void WriteEntry(size_t at, const Entry& entry) {
    for (size_t i = 0; i < entry.name.size(); ++i) Put(at + 2 * i, entry.name[i], 2);
    const bool is_used = !entry.name.empty();
    if (is_used) {
      Put(at + kEntryNameSize, static_cast<uint32_t>(2 * entry.name.size() + 2), 2);
      Put(at + kEntryType, entry.type, 1);
      Put(at + kEntryColour, entry.is_red ? 0 : 1, 1);
      Put(at + kEntryStart, entry.start);
      Put(at + kEntryStreamSize, entry.size);
    }
    Put(at + kEntryLeft, entry.left);
    Put(at + kEntryRight, entry.right);
    Put(at + kEntryChild, entry.child);
  }

  void PlaceTables() {
    list_start_ = next_.size();
    for (size_t i = 0; i < list_sectors_; ++i) next_.push_back(kListSector);
    table_start_ = next_.size();
    for (size_t i = 0; i < table_sectors_; ++i) next_.push_back(kTableSector);
    next_.resize(table_sectors_ * kNumbersInSector, kFree);
    for (size_t i = 0; i < next_.size(); ++i) Put(OffsetOf(table_start_) + i * sizeof(uint32_t), next_[i]);
    constexpr size_t kInList = kNumbersInSector - 1;
    for (size_t i = 0; i < list_sectors_ * kInList; ++i) {
      Put(OffsetOf(list_start_ + i / kInList) + i % kInList * sizeof(uint32_t), TableSector(kTablesInHeader + i));
    }
    for (size_t i = 0; i < list_sectors_; ++i) {
      const auto next = static_cast<uint32_t>(list_start_ + i + 1);
      Put(OffsetOf(list_start_ + i) + kInList * sizeof(uint32_t), i + 1 < list_sectors_ ? next : kEndOfChain);
    }
  }
  uint32_t TableSector(size_t index) const {
    return index < table_sectors_ ? static_cast<uint32_t>(table_start_ + index) : kFree;
  }

  void WriteHeader() {
    std::ranges::copy(kMagic, bytes_.begin());
    Put(24, 0x3E, 2);  // minor and major version
    Put(26, 3, 2);
    Put(28, 0xFFFE, 2);  // little-endian
    Put(kSectorShift, kSmallSectors, 2);
    Put(32, 6, 2);  // short sectors of 2^6 bytes
    Put(44, static_cast<uint32_t>(table_sectors_));
    Put(kFirstDirectorySector, directory_start_);
    Put(56, kShortStreamBelow);
    Put(kFirstShortTableSector, short_table_start_);
    Put(64, static_cast<uint32_t>(short_table_sectors_));
    Put(kFirstListSector, list_sectors_ > 0 ? static_cast<uint32_t>(list_start_) : kEndOfChain);
    Put(72, static_cast<uint32_t>(list_sectors_));
    for (size_t i = 0; i < kTablesInHeader; ++i) Put(kListInHeader + i * sizeof(uint32_t), TableSector(i));
  }

  std::vector<Entry> entries_;  // the root first
  std::string problem_;
  size_t sectors_ = 0;  // behind the header
  size_t short_sectors_ = 0;
  size_t short_table_sectors_ = 0;
  size_t table_sectors_ = 0;
  size_t list_sectors_ = 0;
  size_t list_start_ = 0;
  size_t table_start_ = 0;
  uint32_t directory_start_ = 0;
  uint32_t short_table_start_ = kEndOfChain;
  std::vector<uint32_t> next_;  // the allocation table
  std::vector<uint8_t> bytes_;
};

}  // namespace

std::string SerializeCompoundFile(const CompoundStorage& root, std::vector<uint8_t>& file) {
  return Writer().Write(root, file);
}

}  // namespace kral
