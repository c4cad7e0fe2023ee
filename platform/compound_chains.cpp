// Walks every chain of a compound document once. Each sector and each directory entry belongs to one chain only, so
// whatever is met a second time is a circle or a crossing.
#include "platform/compound_chains.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <vector>

namespace kral {
namespace {

constexpr std::array<uint8_t, 8> kMagic = {0xD0, 0xCF, 0x11, 0xE0, 0xA1, 0xB1, 0x1A, 0xE1};
constexpr size_t kHeaderSize = 512;
constexpr size_t kSectorShift = 30;
constexpr size_t kFirstDirectorySector = 48;
constexpr size_t kFirstShortTableSector = 60;
constexpr size_t kFirstListSector = 68;
constexpr size_t kListInHeader = 76;  // sectors of the allocation table, up to the header's end
constexpr uint32_t kShortStreamBelow = 4096;
constexpr uint32_t kLastSector = 0xFFFFFFFA;  // larger numbers are marks: end of chain, free ...
constexpr uint32_t kNoEntry = 0xFFFFFFFF;

constexpr size_t kEntrySize = 128;
constexpr size_t kEntryType = 66;
constexpr std::array<size_t, 3> kEntryLinks = {68, 72, 76};  // left, right, child
constexpr size_t kEntryStart = 116;
constexpr size_t kEntryStreamSize = 120;
constexpr uint8_t kStream = 2;
constexpr uint8_t kRoot = 5;

uint32_t Word(std::span<const uint8_t> bytes, size_t offset) {
  uint32_t value = 0;
  for (size_t i = 0; i < 4; ++i) value |= static_cast<uint32_t>(bytes[offset + i]) << (8 * i);
  return value;
}

// A table of "next" numbers, and which of them have been walked over.
class Chains {
 public:
  void Append(std::span<const uint8_t> sector) {
    for (size_t i = 0; i + 4 <= sector.size(); i += 4) next_.push_back(Word(sector, i));
  }

  // Adds the walked numbers to `walked`.
  bool Walk(uint32_t start, std::vector<uint32_t>& walked) {
    seen_.resize(next_.size());
    for (uint32_t at = start; at <= kLastSector; at = next_[at]) {
      if (at >= next_.size() || seen_[at]) return false;
      seen_[at] = true;
      walked.push_back(at);
    }
    return true;
  }

 private:
  std::vector<uint32_t> next_;
  std::vector<bool> seen_;
};

class Document {
 public:
  Document(std::span<const uint8_t> file, unsigned shift) : file_(file), shift_(shift) {}

  bool ChainsEnd() { return ReadTable() && ReadDirectory() && WalkTree(); }

 private:
  // Empty behind the end of the file. The last sector may be cut.
  std::span<const uint8_t> Sector(uint32_t number) const {
    const uint64_t begin = (uint64_t{number} + 1) << shift_;
    if (begin >= file_.size()) return {};
    const auto from = static_cast<size_t>(begin);
    return file_.subspan(from, std::min(file_.size() - from, size_t{1} << shift_));
  }

  bool AppendTable(std::span<const uint8_t> list) {
    for (size_t i = 0; i + 4 <= list.size(); i += 4) {
      const uint32_t number = Word(list, i);
      if (number > kLastSector) continue;
      const auto sector = Sector(number);
      // More table than file means that a sector is listed again and again.
      if (sector.empty() || ++table_sectors_ > file_.size() >> shift_) return false;
      long_.Append(sector);
    }
    return true;
  }

  bool ReadTable() {
    if (!AppendTable(file_.subspan(kListInHeader, kHeaderSize - kListInHeader))) return false;
    size_t lists = 0;
    for (uint32_t at = Word(file_, kFirstListSector); at <= kLastSector;) {
      const auto list = Sector(at);
      if (list.size() != size_t{1} << shift_ || ++lists > file_.size() >> shift_) return false;
      if (!AppendTable(list.first(list.size() - 4))) return false;
      at = Word(list, list.size() - 4);
    }
    return true;
  }

  bool ReadDirectory() {
    std::vector<uint32_t> sectors;
    if (!long_.Walk(Word(file_, kFirstDirectorySector), sectors)) return false;
    for (const uint32_t number : sectors) {
      const auto sector = Sector(number);
      directory_.insert(directory_.end(), sector.begin(), sector.end());
    }
    std::vector<uint32_t> table;
    if (!long_.Walk(Word(file_, kFirstShortTableSector), table)) return false;
    for (const uint32_t number : table) short_.Append(Sector(number));
    return true;
  }

  bool WalkTree() {
    std::vector<bool> seen(directory_.size() / kEntrySize);
    std::vector<uint32_t> waiting = {0};
    while (!waiting.empty()) {
      const uint32_t number = waiting.back();
      waiting.pop_back();
      if (number >= seen.size() || seen[number]) return false;
      seen[number] = true;
      const auto entry = std::span<const uint8_t>(directory_).subspan(number * kEntrySize, kEntrySize);
      if (!WalkContent(entry)) return false;
      for (const size_t link : kEntryLinks) {
        if (Word(entry, link) != kNoEntry) waiting.push_back(Word(entry, link));
      }
    }
    return true;
  }

  bool WalkContent(std::span<const uint8_t> entry) {
    const uint8_t type = entry[kEntryType];
    const uint32_t size = Word(entry, kEntryStreamSize);
    if ((type != kStream && type != kRoot) || size == 0) return true;
    // The root's content is what holds the short streams.
    Chains& chains = type == kStream && size < kShortStreamBelow ? short_ : long_;
    std::vector<uint32_t> sectors;
    return chains.Walk(Word(entry, kEntryStart), sectors);
  }

  const std::span<const uint8_t> file_;
  const unsigned shift_;
  size_t table_sectors_ = 0;
  Chains long_;
  Chains short_;
  std::vector<uint8_t> directory_;
};

}  // namespace

bool CompoundChainsEnd(std::span<const uint8_t> file) {
  if (file.size() < kHeaderSize || !std::equal(kMagic.begin(), kMagic.end(), file.begin())) return true;
  const unsigned shift = file[kSectorShift] | unsigned{file[kSectorShift + 1]} << 8;
  return (shift == 9 || shift == 12) && Document(file, shift).ChainsEnd();
}

}  // namespace kral
