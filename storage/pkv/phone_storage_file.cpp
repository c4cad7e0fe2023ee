// The frame of a PKV file; what is in the configuration belongs to nv_storage, item_array and
// file_section.
#include "storage/pkv/phone_storage_file.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <string_view>

#include "base/little_endian.h"
#include "frame/version.h"
#include "storage/pkv/nv_storage.h"
#include "storage/pkv/pkv_format.h"

namespace kral::pkv {

std::string PkvVersionText() {
  std::array<char, 48> text{};
  std::snprintf(text.data(), text.size(), "VARN %u.%u.%u", kVersionMajor, kVersionMinor, kVersionPatch);
  return text.data();
}

std::string CPhoneStorageFile::Open(const std::string& path) {
  return LoadCompoundFile(path, root_);
}

std::string CPhoneStorageFile::Save(const std::string& path) const {
  return SaveCompoundFile(path, root_);
}

CompoundStorage* CPhoneStorageFile::FindConfiguration() {
  if (CompoundStorage* const found = root_.FindStorage(kConfiguration)) return found;
  return CNVStorage::Subscriptions(root_).empty() ? nullptr : &root_;
}

CompoundStorage& CPhoneStorageFile::configuration() {
  return root_.OpenOrAddStorage(kConfiguration);
}

std::vector<uint8_t> CPhoneStorageFile::PropertyBytes(const PkvProperties& properties) {
  std::string text = properties.version + '\n';
  for (const auto& [name, value] : properties.values) text.append(name).append(1, '=').append(value).append(1, '\n');
  return {text.begin(), text.end()};
}

std::vector<uint8_t> CPhoneStorageFile::VersionBytes() {
  std::vector<uint8_t> bytes(8);
  StoreLe<uint32_t>(bytes, 0, kLayoutMajor);
  StoreLe<uint32_t>(bytes, 4, kLayoutMinor);
  return bytes;
}

PkvProperties CPhoneStorageFile::properties() {
  PkvProperties properties;
  const CompoundStorage* const configuration = FindConfiguration();
  const CompoundStream* const stream = configuration != nullptr ? configuration->FindStream(kPropertyInfo) : nullptr;
  if (stream == nullptr) return properties;
  std::string_view rest(reinterpret_cast<const char*>(stream->bytes.data()), stream->bytes.size());
  bool first = true;
  while (!rest.empty()) {
    const std::string_view line = rest.substr(0, rest.find('\n'));
    rest.remove_prefix(std::min(line.size() + 1, rest.size()));
    const size_t equals = line.find('=');
    if (first) {
      properties.version = line;
    } else if (equals != std::string_view::npos) {
      properties.values.emplace_back(line.substr(0, equals), line.substr(equals + 1));
    }
    first = false;
  }
  return properties;
}

CompoundStream* CPhoneStorageFile::FeatureMask() {
  CompoundStorage* const configuration = FindConfiguration();
  return configuration != nullptr ? configuration->FindStream(kFeatureMask) : nullptr;
}

CompoundStream* CPhoneStorageFile::RoamingList(uint32_t number) {
  CompoundStorage* const configuration = FindConfiguration();
  const std::string name = std::string(kRoamingListPrefix) + std::to_string(number);
  return configuration != nullptr ? configuration->FindStream(name) : nullptr;
}

}  // namespace kral::pkv
