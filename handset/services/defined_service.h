// Commands of a definition file (docs/commands.md), answered as the file says: a request out of its ranges is refused,
// what was set is remembered by the name of its field, and replies hold what was remembered, else defaults.
#ifndef KRAL_HANDSET_SERVICES_DEFINED_SERVICE_H
#define KRAL_HANDSET_SERVICES_DEFINED_SERVICE_H

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "handset/line/request_table.h"
#include "handset/services/ftm_service.h"

namespace kral::handset {

// One field as the file has it.
struct DefinedField {
  std::string name;
  std::string type;  // "u16", "bytes", "record"; "bits" for a word of them
  size_t width = 0;
  bool big = false;
  unsigned first_bit = 0;
  unsigned bits = 0;
  std::optional<double> least;
  std::optional<double> most;
  std::string preset;
  std::string success;
  std::string count;
  std::string size;
  std::optional<size_t> most_elements;  // where the count is not fixed
  std::optional<size_t> most_bytes;     // where the size is not
  std::string when;
  std::map<std::string, std::string> words;  // of an enumeration, with their numbers
  std::vector<DefinedField> fields;
};

struct DefinedCommand {
  std::string family;
  std::vector<DefinedField> request;
  std::vector<DefinedField> reply;
};

// Values as texts, by family and path: numbers in decimal, others byte for byte.
using DefinedValues = std::map<std::string, std::string>;

// Families under 75 and FTM with a mode id of their own, and plain diagnostic commands. Those that use the current mode
// id, or command code 59, are the FTM service's.
class DefinedService final : public Service {
 public:
  // Throws std::invalid_argument with the reason for a file that cannot be used. To be added to a handset afterwards.
  void Load(const std::string& path, FtmService& ftm);

  void Register(RequestTable& table) override;
  void OnReset() override;  // forgets what was set by requests

  // "WLAN.power", "WLAN.points[0].power": for the replies to come, whatever requests say. Throws std::invalid_argument
  // with the reason for what no reply of the family can hold.
  void Set(const std::string& path, const std::string& value);
  // The same, but for the setting; gives the value as it would be kept.
  std::string Checked(const std::string& path, const std::string& value) const;
  // What a request has set; nothing for none.
  std::optional<std::string> Value(const std::string& path) const;

 private:
  std::optional<Bytes> Answer(const DefinedCommand& command, ByteView fields, Refusal& refusal);

  mutable std::mutex mutex_;
  std::vector<std::pair<uint32_t, std::shared_ptr<DefinedCommand>>>
      plain_;  // by 0x100 and the code; subsystem, command
  std::map<uint16_t, std::map<uint16_t, std::shared_ptr<DefinedCommand>>> ftm_;  // by mode id and command id
  DefinedValues remembered_;
  DefinedValues fixed_;
};

}  // namespace kral::handset

#endif
