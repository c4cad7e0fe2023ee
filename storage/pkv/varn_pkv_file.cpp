// Writing and walking the library's own PKV files; the records and names are those of pkv_format.h.
#include "storage/pkv/varn_pkv_file.h"

#include <algorithm>
#include <map>
#include <span>
#include <utility>

#include "base/little_endian.h"
#include "storage/pkv/nv_storage.h"

namespace kral::pkv {
struct ItemPlace {
  uint32_t id;                      // as the names of the streams tell it
  std::span<const uint8_t> record;  // up to the end of its stream
  bool numbered;
  uint16_t subscription;
};

namespace {

// In the order of subscriptions: the array in the order of its records, then the numbered items by id.
void AppendArray(CompoundStorage& configuration, uint16_t subscription, std::vector<ItemPlace>& places) {
  const CompoundStream* const stream = configuration.FindStream(NameOfSubscription(kItemArray, subscription));
  if (stream == nullptr) return;
  const std::span<const uint8_t> bytes(stream->bytes);
  PkvNvItem item;
  uint16_t flags = 0;
  for (size_t at = 0; ParseArrayRecord(bytes.subspan(at), item, flags); at += kArrayRecordSize) {
    if ((flags & kRecordInUse) != 0) places.push_back({item.id, bytes.subspan(at), false, subscription});
  }
}

void AppendNumbered(CompoundStorage& configuration, uint16_t subscription, std::vector<ItemPlace>& places) {
  const CompoundStorage* const numbered = configuration.FindStorage(NameOfSubscription(kNumberedItems, subscription));
  if (numbered == nullptr) return;
  for (const CompoundStorage& storage : numbered->storages) {
    const auto id = NumberOfName(storage.name);
    if (!id) continue;
    for (const CompoundStream& stream : storage.streams) places.push_back({*id, stream.bytes, true, subscription});
  }
}

// Where the items of one subscription go: each becomes a numbered item, and leaves the array it may have been in.
struct Target {
  Target(CompoundStorage& configuration, uint16_t subscription)
      : numbered(configuration, subscription, Access::kReadWrite) {
    if (configuration.FindStream(NameOfSubscription(kItemArray, subscription)) != nullptr)
      array.Open(configuration, subscription, Access::kReadWrite);
  }
  void Write(const PkvNvItem& item) {
    array.Delete(item.id, item.index);
    numbered.Write(item);
  }

  CNVStorage numbered;
  CNVItemStream array;
};

// What all streams together may still take; a claim gets what is left of it.
class Room {
 public:
  explicit Room(size_t size) : left_(size) {}
  size_t Claim(size_t wanted) {
    const size_t granted = std::min(wanted, left_);
    left_ -= granted;
    return granted;
  }

 private:
  size_t left_;
};

}  // namespace

struct VARN_PkvFile::Content {
  CPhoneStorageFile file;
  std::vector<ItemPlace> places;
};

class VARN_PkvFile::IteratorImpl {
 public:
  IteratorImpl(std::shared_ptr<const Content> content, size_t position)
      : content_(std::move(content)), position_(position) {
    Load();
  }

  void increamentImpl() {
    if (!at_end()) ++position_;
    Load();
  }

  bool at_end() const { return position_ >= content_->places.size(); }
  const NvItem& item() const { return item_; }
  bool operator==(const IteratorImpl& other) const {
    return content_ == other.content_ && position_ == other.position_;
  }

 private:
  void Load() {
    if (at_end()) return;
    const ItemPlace& place = content_->places[position_];
    NvItem item;
    uint16_t flags = 0;
    const bool read =
        place.numbered ? ParseNumberedRecord(place.record, item) : ParseArrayRecord(place.record, item, flags);
    if (!read) {
      throw Exception("VARN_PkvFile::IteratorImpl::increamentImpl() - Tried to read NV Item: " +
                      std::to_string(place.id) + ". Was only able to read " + std::to_string(place.record.size()) +
                      " out of " + std::to_string(kNumberedRecordSize));
    }
    // Another id or length word: the record is another one's, or out of step.
    const auto length = LoadLe<uint16_t>(place.record, place.numbered ? kNumberedLength : 0);
    if (item.id != place.id || length != (place.numbered ? kNumberedRecordSize : kArrayRecordSize)) {
      throw Exception("VARN_PkvFile::IteratorImpl::increamentImpl() - NV Item: " + std::to_string(place.id) +
                      " is damaged");
    }
    item.subscription = place.subscription;
    item_ = item;
  }

  std::shared_ptr<const Content> content_;
  size_t position_;
  NvItem item_;
};

// --- Iterator -------------------------------------------------------------------------------------------------------

VARN_PkvFile::Iterator::Iterator() = default;
VARN_PkvFile::Iterator::~Iterator() = default;
VARN_PkvFile::Iterator::Iterator(std::unique_ptr<IteratorImpl> impl) : impl_(std::move(impl)) {}
VARN_PkvFile::Iterator::Iterator(const Iterator& other)
    : impl_(other.impl_ ? std::make_unique<IteratorImpl>(*other.impl_) : nullptr) {}

VARN_PkvFile::Iterator& VARN_PkvFile::Iterator::operator=(const Iterator& other) {
  Iterator copy(other);
  impl_.swap(copy.impl_);
  return *this;
}

VARN_PkvFile::IteratorImpl& VARN_PkvFile::Iterator::impl(const char* operation) const {
  if (impl_) return *impl_;
  throw Exception(std::string("VARN_PkvFile::Iterator::") + operation + " - The iterator is not initialized.");
}

const VARN_PkvFile::NvItem& VARN_PkvFile::Iterator::item(const char* operation) const {
  if (!impl(operation).at_end()) return impl_->item();
  throw Exception(std::string("VARN_PkvFile::Iterator::") + operation + " - The iterator is at the end.");
}

const VARN_PkvFile::NvItem& VARN_PkvFile::Iterator::operator*() const {
  return item("operator*()");
}

const VARN_PkvFile::NvItem* VARN_PkvFile::Iterator::operator->() const {
  return &item("operator->()");
}

VARN_PkvFile::Iterator& VARN_PkvFile::Iterator::operator++() {
  impl("operator++()").increamentImpl();
  return *this;
}

VARN_PkvFile::Iterator VARN_PkvFile::Iterator::operator++(int) {
  impl("operator++( int )");
  Iterator before(*this);
  impl_->increamentImpl();
  return before;
}

bool VARN_PkvFile::Iterator::operator==(const VARN_PkvFile::Iterator& rhs) const {
  constexpr const char* kName = "operator==( const VARN_PkvFile::Iterator& rhs )";
  return impl(kName) == rhs.impl(kName);
}

bool VARN_PkvFile::Iterator::operator!=(const VARN_PkvFile::Iterator& rhs) const {
  constexpr const char* kName = "operator!=( const VARN_PkvFile::Iterator& rhs )";
  return !(impl(kName) == rhs.impl(kName));
}

// --- The file -------------------------------------------------------------------------------------------------------

VARN_PkvFile::VARN_PkvFile() : properties_{.version = PkvVersionText(), .values = {}} {}
VARN_PkvFile::VARN_PkvFile(std::string file_name) : VARN_PkvFile() {
  file_name_ = std::move(file_name);
}
VARN_PkvFile::~VARN_PkvFile() = default;

VARN_PkvFile::Iterator VARN_PkvFile::begin() {
  if (!content_ && file_name_.empty()) {
    throw Exception(
        "VARN_PkvFile::begin() - Error no PKV file has been opened.  Either create the PKV with a file name, or call "
        "the open member function with a file name as a parameter.");
  }
  if (!content_) open(std::string(file_name_));
  return Iterator(std::make_unique<IteratorImpl>(content_, 0));
}

VARN_PkvFile::Iterator VARN_PkvFile::end() {
  if (!content_) begin();
  return Iterator(std::make_unique<IteratorImpl>(content_, content_->places.size()));
}

void VARN_PkvFile::open(const std::string& file_name) {
  auto content = std::make_shared<Content>();
  std::string problem = content->file.Open(file_name);
  CompoundStorage* const configuration = content->file.FindConfiguration();
  if (problem.empty() && configuration == nullptr) problem = file_name + ": no PKV file";
  if (!problem.empty()) throw Exception("VARN_PkvFile::open() - " + problem);
  for (const uint16_t subscription : CNVStorage::Subscriptions(*configuration)) {
    AppendArray(*configuration, subscription, content->places);
    AppendNumbered(*configuration, subscription, content->places);
  }
  file_name_ = file_name;
  properties_ = content->file.properties();
  content_ = std::move(content);
}

VARN_PkvFile& VARN_PkvFile::operator<<(const NvItem& item) {
  items_.push_back(item);
  return *this;
}

VARN_PkvFile& VARN_PkvFile::operator<<(const PkvEfsFile& file) {
  files_.push_back(file);
  return *this;
}

void VARN_PkvFile::writeToDisk() {
  if (items_.empty()) {
    throw Exception(
        "VARN_PkvFile::writeToDisk() - Before calling this member function you need to add at least 1 NV item to the "
        "this object using the insertion operator.");
  }
  // A copy: iterators over what was read stay as they are.
  CPhoneStorageFile file = content_ ? content_->file : CPhoneStorageFile();
  writeToDiskImpl(file);
  if (const std::string problem = file.Save(file_name_); !problem.empty())
    throw Exception("VARN_PkvFile::writeToDisk() - " + problem);
}

void VARN_PkvFile::writeToDiskImpl(CPhoneStorageFile& file) const {
  CompoundStorage* const found = file.FindConfiguration();
  CompoundStorage& configuration = found != nullptr ? *found : file.configuration();
  const auto raise = [](const std::string& what, size_t written, const std::string& of) {
    throw Exception("VARN_PkvFile::writeToDiskImpl() - Tried to write " + what + " was only able to write " +
                    std::to_string(written) + " out of " + of + " bytes");
  };
  Room room(size_limit_);
  std::map<uint16_t, Target> targets;
  for (const NvItem& item : items_) {
    const size_t granted = room.Claim(kNumberedRecordSize);
    if (granted != kNumberedRecordSize)
      raise("NV Item: '" + std::to_string(item.id) + "' but", granted, std::to_string(kNumberedRecordSize));
    targets.try_emplace(item.subscription, configuration, item.subscription).first->second.Write(item);
  }
  for (const PkvEfsFile& entry : files_) {
    const size_t size = kEntryPath + entry.path.size() + entry.bytes.size();
    const size_t granted = room.Claim(size);
    if (granted != size) raise("EFS File: '" + entry.path + "' but", granted, std::to_string(size));
  }
  WriteEfsFiles(configuration, files_);
  const auto write = [&](CompoundStorage& storage, std::string_view name, std::vector<uint8_t> bytes,
                         const char* what) {
    const size_t granted = room.Claim(bytes.size());
    if (granted != bytes.size()) raise(what, granted, std::to_string(bytes.size()));
    storage.OpenOrAddStream(name).bytes = std::move(bytes);
  };
  write(configuration, kPropertyInfo, CPhoneStorageFile::PropertyBytes(properties_), "the Mobile_Property_Info but");
  write(file.root(), kFileVersion, CPhoneStorageFile::VersionBytes(), "the File_Version Stream but");
}

}  // namespace kral::pkv
