// Reads compound documents into the tree, alike on both platforms. The systems' own readers take too much on trust
// here: a circle of sectors keeps one of them for ever, the other goes one call deeper for each sibling until the stack
// is used up, and both take time with the square of the siblings.
#include <algorithm>
#include <array>
#include <cstddef>
#include <optional>
#include <utility>
#include <vector>

#include "platform/compound_file.h"
#include "platform/compound_format.h"

namespace kral {
namespace {

using namespace compound;

using Bytes = std::span<const uint8_t>;

uint32_t Number(Bytes bytes, size_t offset, size_t size = 4) {
  uint32_t value = 0;
  for (size_t i = 0; i < size; ++i) value |= static_cast<uint32_t>(bytes[offset + i]) << (8 * i);
  return value;
}

void AppendUtf8(uint32_t code, std::string& text) {
  if (code < 0x80) {
    text += static_cast<char>(code);
    return;
  }
  const int more = code < 0x800 ? 1 : code < 0x10000 ? 2 : 3;
  constexpr std::array<uint32_t, 4> kLead = {0, 0xC0, 0xE0, 0xF0};
  text += static_cast<char>(kLead[static_cast<size_t>(more)] | code >> (6 * more));
  for (int i = more - 1; i >= 0; --i) text += static_cast<char>(0x80 | (code >> (6 * i) & 0x3F));
}

// Nothing for what is no UTF-16, and for an empty name.
std::optional<std::string> NameOf(Bytes entry) {
  const size_t size = Number(entry, kEntryNameSize, 2);
  if (size < 4 || size > kEntryNameSize || size % 2 != 0 || Number(entry, size - 2, 2) != 0) return std::nullopt;
  std::string name;
  for (size_t at = 0; at + 2 < size; at += 2) {
    uint32_t code = Number(entry, at, 2);
    if (code >= 0xD800 && code < 0xE000) {
      at += 2;
      const uint32_t low = Number(entry, at, 2);  // the terminator at the worst
      if (code >= 0xDC00 || low < 0xDC00 || low >= 0xE000) return std::nullopt;
      code = 0x10000 + ((code - 0xD800) << 10) + (low - 0xDC00);
    }
    if (code == 0) return std::nullopt;
    AppendUtf8(code, name);
  }
  return name;
}

// An allocation table: for each sector the next one of its chain. A sector belongs to one chain only, so whatever is
// met a second time is a circle or a crossing.
class AllocationTable {
 public:
  void Append(Bytes sector) {
    for (size_t i = 0; i + 4 <= sector.size(); i += 4) next_.push_back(Number(sector, i));
  }

  bool Walk(uint32_t start, std::vector<uint32_t>& chain) {
    walked_.resize(next_.size());
    for (uint32_t at = start; at <= kLastSector; at = next_[at]) {
      if (at >= next_.size() || walked_[at]) return false;
      walked_[at] = true;
      chain.push_back(at);
    }
    return true;
  }

 private:
  std::vector<uint32_t> next_;
  std::vector<bool> walked_;
};

class Reader {
 public:
  explicit Reader(Bytes file) : file_(file) {}

  // Gives the reason why it cannot be read, or an empty text.
  std::string Read(CompoundStorage& root) {
    if (!ReadHeader() || !ReadTable() || !ReadDirectory() || !ReadStorage(0, root, 0)) return problem_;
    return {};
  }

 private:
  bool Fail(std::string problem) {
    problem_ = std::move(problem);
    return false;
  }
  bool FailInChains() { return Fail("its sectors run in circles or lead out of the file"); }

  bool ReadHeader() {
    if (file_.size() < kHeaderSize || !std::equal(kMagic.begin(), kMagic.end(), file_.begin()))
      return Fail("no compound document");
    shift_ = Number(file_, kSectorShift, 2);
    return shift_ == kSmallSectors || shift_ == kLargeSectors || Fail("sectors of an unknown size");
  }

  // Empty behind the end of the file. The last sector may be cut.
  Bytes Sector(uint32_t number) const {
    const uint64_t begin = (uint64_t{number} + 1) << shift_;
    if (begin >= file_.size()) return {};
    const auto from = static_cast<size_t>(begin);
    return file_.subspan(from, std::min(file_.size() - from, size_t{1} << shift_));
  }

  // The short sectors lie in the content of the root, one behind the other.
  Bytes ShortSector(uint32_t number) const {
    const uint64_t begin = uint64_t{number} * kShortSectorSize;
    if (begin >> shift_ >= short_sectors_.size()) return {};
    const Bytes sector = Sector(short_sectors_[static_cast<size_t>(begin >> shift_)]);
    const size_t from = static_cast<size_t>(begin) & ((size_t{1} << shift_) - 1);
    return from < sector.size() ? sector.subspan(from, std::min(sector.size() - from, kShortSectorSize)) : Bytes();
  }

  // No table can have more sectors than the file; more of them means that one is listed again and again.
  bool AppendTable(Bytes list) {
    for (size_t i = 0; i + 4 <= list.size(); i += 4) {
      const uint32_t number = Number(list, i);
      if (number > kLastSector) continue;
      const Bytes sector = Sector(number);
      if (sector.empty() || ++table_sectors_ > file_.size() >> shift_) return FailInChains();
      table_.Append(sector);
    }
    return true;
  }

  // The first sectors of the table are listed in the header, the others in a chain of sectors that end with the next.
  bool ReadTable() {
    if (!AppendTable(file_.subspan(kListInHeader, kHeaderSize - kListInHeader))) return false;
    size_t lists = 0;
    for (uint32_t at = Number(file_, kFirstListSector); at <= kLastSector;) {
      const Bytes list = Sector(at);
      if (list.size() != size_t{1} << shift_ || ++lists > file_.size() >> shift_) return FailInChains();
      if (!AppendTable(list.first(list.size() - 4))) return false;
      at = Number(list, list.size() - 4);
    }
    return true;
  }

  bool ReadDirectory() {
    std::vector<uint32_t> chain;
    if (!table_.Walk(Number(file_, kFirstDirectorySector), chain)) return FailInChains();
    for (const uint32_t number : chain) {
      const Bytes sector = Sector(number);
      directory_.insert(directory_.end(), sector.begin(), sector.end());
    }
    met_.resize(directory_.size() / kEntrySize);
    chain.clear();
    if (!table_.Walk(Number(file_, kFirstShortTableSector), chain)) return FailInChains();
    for (const uint32_t number : chain) short_table_.Append(Sector(number));
    if (met_.empty() || Entry(0)[kEntryType] != kRoot) return Fail("no directory");
    if (Number(Entry(0), kEntryStreamSize) == 0) return true;  // no short streams, wherever the content seems to begin
    return table_.Walk(Number(Entry(0), kEntryStart), short_sectors_) || FailInChains();
  }

  Bytes Entry(uint32_t number) const { return Bytes(directory_).subspan(number * kEntrySize, kEntrySize); }

  // The siblings are a tree, here taken in order. A stack of our own, as the tree may be a chain of any length.
  bool ReadStorage(uint32_t number, CompoundStorage& storage, size_t depth) {
    if (depth > kCompoundDepthLimit) return Fail("storages nested too deeply");
    std::vector<uint32_t> waiting;
    uint32_t at = Number(Entry(number), kEntryChild);
    while (at != kNoEntry || !waiting.empty()) {
      for (; at != kNoEntry; at = Number(Entry(at), kEntryLeft)) {
        if (at >= met_.size() || met_[at]) return Fail("its directory runs in circles or leads out of the file");
        met_[at] = true;
        waiting.push_back(at);
      }
      const uint32_t sibling = waiting.back();
      waiting.pop_back();
      if (!ReadEntry(sibling, storage, depth)) return false;
      at = Number(Entry(sibling), kEntryRight);
    }
    return true;
  }

  bool ReadEntry(uint32_t number, CompoundStorage& parent, size_t depth) {
    if (++entries_ > kCompoundEntryLimit) return Fail("too many entries");
    const Bytes entry = Entry(number);
    auto name = NameOf(entry);
    if (!name) return Fail("an entry has a damaged name");
    if (entry[kEntryType] == kStorage) {
      CompoundStorage& storage = parent.storages.emplace_back();
      storage.name = std::move(*name);
      return ReadStorage(number, storage, depth + 1);
    }
    if (entry[kEntryType] != kStream) return Fail("entry " + *name + " is neither storage nor stream");
    CompoundStream& stream = parent.streams.emplace_back();
    stream.name = std::move(*name);
    return ReadContent(entry, stream);
  }

  // As no sector is read twice, all contents together are no larger than the file.
  bool ReadContent(Bytes entry, CompoundStream& stream) {
    const uint32_t size = Number(entry, kEntryStreamSize);
    const bool beyond_4_gib = shift_ == kLargeSectors && Number(entry, kEntryStreamSize + 4) != 0;
    if (beyond_4_gib || size > file_.size()) return FailCutShort(stream);
    if (size == 0) return true;
    const bool is_short = size < kShortStreamBelow;
    std::vector<uint32_t> chain;
    if (!(is_short ? short_table_ : table_).Walk(Number(entry, kEntryStart), chain)) return FailInChains();
    const size_t sector_size = is_short ? kShortSectorSize : size_t{1} << shift_;
    if (chain.size() < (size - 1) / sector_size + 1) return FailCutShort(stream);
    stream.bytes.reserve(size);
    for (size_t i = 0; stream.bytes.size() < size; ++i) {
      const Bytes sector = is_short ? ShortSector(chain[i]) : Sector(chain[i]);
      const size_t wanted = std::min(sector_size, size - stream.bytes.size());
      if (sector.size() < wanted) return FailCutShort(stream);
      stream.bytes.insert(stream.bytes.end(), sector.begin(), sector.begin() + static_cast<std::ptrdiff_t>(wanted));
    }
    return true;
  }
  bool FailCutShort(const CompoundStream& stream) { return Fail("stream " + stream.name + " is cut short"); }

  const Bytes file_;
  uint32_t shift_ = 0;
  size_t table_sectors_ = 0;
  AllocationTable table_;
  AllocationTable short_table_;
  std::vector<uint32_t> short_sectors_;  // the long ones that hold them
  std::vector<uint8_t> directory_;
  std::vector<bool> met_;  // which entries
  size_t entries_ = 0;
  std::string problem_;
};

}  // namespace

std::string ParseCompoundFile(Bytes file, CompoundStorage& root) {
  CompoundStorage tree;
  std::string problem = Reader(file).Read(tree);
  if (problem.empty()) root = std::move(tree);
  return problem;
}

}  // namespace kral
