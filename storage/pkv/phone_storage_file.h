// A PKV file as a whole: the configuration of one phone, its properties and the version of the layout.
#ifndef KRAL_STORAGE_PKV_PHONE_STORAGE_FILE_H
#define KRAL_STORAGE_PKV_PHONE_STORAGE_FILE_H

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "platform/compound_file.h"

namespace kral::pkv {

// Of the handset a file was made from.
struct PkvProperties {
  std::string version;                                      // of the library that made the file: "VARN 6.0.29"
  std::vector<std::pair<std::string, std::string>> values;  // names without '='; neither holds line ends
};

class CPhoneStorageFile {
 public:
  // An empty text, or why not; the object is then as before.
  std::string Open(const std::string& path);
  std::string Save(const std::string& path) const;

  // A file without a "Default_Phone_Configuration" whose root holds items is taken as a bare configuration. Null when
  // there is neither.
  CompoundStorage* FindConfiguration();
  CompoundStorage& configuration();  // made when missing

  PkvProperties properties();
  // What "Mobile_Property_Info" and "File_Version" hold.
  static std::vector<uint8_t> PropertyBytes(const PkvProperties& properties);
  static std::vector<uint8_t> VersionBytes();

  // Carried, not interpreted; null when absent.
  CompoundStream* FeatureMask();
  CompoundStream* RoamingList(uint32_t number);

  CompoundStorage& root() { return root_; }

 private:
  CompoundStorage root_;
};

// "VARN 6.0.29"
std::string PkvVersionText();

}  // namespace kral::pkv

#endif
