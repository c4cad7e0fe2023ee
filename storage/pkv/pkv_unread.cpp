// Goes through the tree by the names of pkv_format.h, as the readers do, and keeps what they leave.
#include "storage/pkv/pkv_unread.h"

#include <set>
#include <string_view>
#include <utility>

#include "storage/pkv/pkv_format.h"

namespace kral::pkv {
namespace {

class Finder {
 public:
  std::vector<std::string> Take() { return std::move(parts_); }

  void SearchConfiguration(const CompoundStorage& configuration) {
    SearchItems(configuration, "");
    SearchFiles(configuration, kItemFiles);
    SearchFiles(configuration, kEfsBackup);
    const CompoundStorage* const backup = configuration.FindStorage(kEfsBackup);
    if (backup == nullptr) return;
    if (backup->FindStream(kBackupItems) != nullptr) Add(PathOf("", *backup), kBackupItems, "a stream, no storage");
    if (const CompoundStorage* const items = backup->FindStorage(kBackupItems)) {
      SearchItems(*items, PathOf(PathOf("", *backup), *items));
    }
  }

 private:
  static std::string PathOf(const std::string& parent, const CompoundStorage& storage) {
    return parent + storage.name + "/";
  }
  void Add(const std::string& parent, std::string_view name, const char* why) {
    parts_.push_back(parent + std::string(name) + ": " + why);
  }

  void SearchItems(const CompoundStorage& storage, const std::string& path) {
    for (const CompoundStream& stream : storage.streams) {
      if (stream.name.starts_with(kNumberedItems)) Add(path, stream.name, "a stream, no storage");
      if (!stream.name.starts_with(kItemArray)) continue;
      if (!SubscriptionOfName(stream.name, kItemArray)) {
        Add(path, stream.name, "no such subscription");
      } else if (stream.bytes.size() % kArrayRecordSize != 0) {
        Add(path, stream.name, "a part of a record at its end");
      }
    }
    for (const CompoundStorage& child : storage.storages) {
      if (child.name.starts_with(kItemArray)) Add(path, child.name, "a storage, no stream");
      if (!child.name.starts_with(kNumberedItems)) continue;
      if (SubscriptionOfName(child.name, kNumberedItems)) {
        SearchNumbered(child, PathOf(path, child));
      } else {
        Add(path, child.name, "no such subscription");
      }
    }
  }

  void SearchNumbered(const CompoundStorage& numbered, const std::string& path) {
    for (const CompoundStream& stream : numbered.streams) Add(path, stream.name, "a stream, no storage");
    for (const CompoundStorage& child : numbered.storages) {
      const auto id = NumberOfName(child.name);
      if (!id || *id > UINT16_MAX) {
        Add(path, child.name, "no item has this number");
        continue;
      }
      for (const CompoundStorage& inner : child.storages) Add(PathOf(path, child), inner.name, "a storage, no stream");
    }
  }

  void SearchFiles(const CompoundStorage& configuration, std::string_view name) {
    if (configuration.FindStream(name) != nullptr) Add("", name, "a stream, no storage");
    const CompoundStorage* const files = configuration.FindStorage(name);
    if (files == nullptr) return;
    const std::string path = PathOf("", *files);
    const std::set<uint32_t> entries = SearchNumbers(*files, kEfsDirectory, path, nullptr);
    SearchNumbers(*files, kEfsData, path, &entries);
  }

  // The numbers of one of the two storages of files; `entries` are those that a content belongs to, null of the entries
  // themselves.
  std::set<uint32_t> SearchNumbers(const CompoundStorage& files, std::string_view name, const std::string& path,
                                   const std::set<uint32_t>* entries) {
    std::set<uint32_t> numbers;
    if (files.FindStream(name) != nullptr) Add(path, name, "a stream, no storage");
    const CompoundStorage* const storage = files.FindStorage(name);
    if (storage == nullptr) return numbers;
    const std::string inner = PathOf(path, *storage);
    for (const CompoundStorage& child : storage->storages) Add(inner, child.name, "a storage, no stream");
    for (const CompoundStream& stream : storage->streams) {
      const auto number = EntryOfName(stream.name);
      if (!number) {
        Add(inner, stream.name, "no number of a file");
      } else if (entries != nullptr && !entries->contains(*number)) {
        Add(inner, stream.name, "a content without an entry");
      }
      if (number) numbers.insert(*number);
    }
    return numbers;
  }

  std::vector<std::string> parts_;
};

}  // namespace

std::vector<std::string> UnreadParts(const CompoundStorage& configuration) {
  Finder finder;
  finder.SearchConfiguration(configuration);
  return finder.Take();
}

}  // namespace kral::pkv
