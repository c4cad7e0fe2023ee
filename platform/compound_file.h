// Compound documents (structured storage): a tree of storages and streams, loaded and saved whole. OLE structured
// storage does the saving on Windows, a writer of our own on Linux. Loading is our own on both, see the reader for why.
#ifndef KRAL_PLATFORM_COMPOUND_FILE_H
#define KRAL_PLATFORM_COMPOUND_FILE_H

#include <cstddef>
#include <cstdint>
#include <list>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace kral {

// Names are UTF-8 here and UTF-16 in the file, of at most 31 characters; they are compared exactly.
struct CompoundStream {
  std::string name;
  std::vector<uint8_t> bytes;
};

struct CompoundStorage {
  std::string name;                     // empty in the root
  std::list<CompoundStorage> storages;  // lists: references stay valid while siblings are added
  std::list<CompoundStream> streams;

  CompoundStorage* FindStorage(std::string_view wanted);
  const CompoundStorage* FindStorage(std::string_view wanted) const;
  CompoundStream* FindStream(std::string_view wanted);
  const CompoundStream* FindStream(std::string_view wanted) const;
  CompoundStorage& OpenOrAddStorage(std::string_view wanted);
  CompoundStream& OpenOrAddStream(std::string_view wanted);
};

// What a hostile file may not exceed, read or written.
inline constexpr size_t kCompoundFileLimit = size_t{256} << 20;
inline constexpr size_t kCompoundDepthLimit = 16;
inline constexpr size_t kCompoundEntryLimit = 200000;

// Each gives an empty text, or a sentence that tells why not; the outputs are then as before.
std::string ParseCompoundFile(std::span<const uint8_t> file, CompoundStorage& root);
std::string SerializeCompoundFile(const CompoundStorage& root, std::vector<uint8_t>& file);

// Through memory: the file is read at once, and replaced in one step behind a temporary name. What could not be loaded
// for its size is not saved.
std::string LoadCompoundFile(const std::string& path, CompoundStorage& root);
std::string SaveCompoundFile(const std::string& path, const CompoundStorage& root);

}  // namespace kral

#endif
