// The tree of a compound document and its way to and from a file; the format is the reader's and the system's.
#include "platform/compound_file.h"

#include <algorithm>

#include "platform/file_util.h"

namespace kral {
namespace {

template <class List>
auto* Find(List& list, std::string_view wanted) {
  const auto entry = std::ranges::find_if(list, [wanted](const auto& e) { return e.name == wanted; });
  return entry != list.end() ? &*entry : nullptr;
}

template <class List>
auto& OpenOrAdd(List& list, std::string_view wanted) {
  if (auto* entry = Find(list, wanted)) return *entry;
  auto& added = list.emplace_back();
  added.name = wanted;
  return added;
}

size_t CountEntries(const CompoundStorage& storage) {
  size_t count = storage.streams.size();
  for (const CompoundStorage& child : storage.storages) count += 1 + CountEntries(child);
  return count;
}

}  // namespace

CompoundStorage* CompoundStorage::FindStorage(std::string_view wanted) {
  return Find(storages, wanted);
}
const CompoundStorage* CompoundStorage::FindStorage(std::string_view wanted) const {
  return Find(storages, wanted);
}
CompoundStream* CompoundStorage::FindStream(std::string_view wanted) {
  return Find(streams, wanted);
}
const CompoundStream* CompoundStorage::FindStream(std::string_view wanted) const {
  return Find(streams, wanted);
}
CompoundStorage& CompoundStorage::OpenOrAddStorage(std::string_view wanted) {
  return OpenOrAdd(storages, wanted);
}
CompoundStream& CompoundStorage::OpenOrAddStream(std::string_view wanted) {
  return OpenOrAdd(streams, wanted);
}

std::string LoadCompoundFile(const std::string& path, CompoundStorage& root) {
  std::vector<uint8_t> file;
  if (const std::error_code error = ReadWholeFile(path, kCompoundFileLimit, file)) return path + ": " + error.message();
  const std::string problem = ParseCompoundFile(file, root);
  return problem.empty() ? problem : path + ": " + problem;
}

std::string SaveCompoundFile(const std::string& path, const CompoundStorage& root) {
  if (CountEntries(root) > kCompoundEntryLimit) return path + ": too many entries";
  std::vector<uint8_t> file;
  if (const std::string problem = SerializeCompoundFile(root, file); !problem.empty()) return path + ": " + problem;
  if (file.size() > kCompoundFileLimit) return path + ": too large";
  if (const std::error_code error = ReplaceWholeFile(path, file)) return path + ": " + error.message();
  return {};
}

}  // namespace kral
