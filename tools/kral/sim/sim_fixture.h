// The simulated handsets of one process, each on a pseudo terminal of its own.
#ifndef KRAL_TOOLS_SIM_SIM_FIXTURE_H
#define KRAL_TOOLS_SIM_SIM_FIXTURE_H

#include <cstdint>
#include <list>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "handset/log_generator.h"
#include "handset/pty_cable.h"
#include "handset/virtual_handset.h"

namespace kral::tool {

struct SimOptions {
  handset::Identity identity;  // of the first one; the others have the serial numbers behind it
  std::uint16_t count = 1;
  std::vector<std::string> commands;  // definition files, whose families are answered
  std::string pkv;                    // restored to each of them before it is connected
  std::string ports;                  // folder for links com1, com2, ...
  std::string script;
  std::string rate;
  std::optional<std::uint16_t> switches;
  std::uint32_t switching_delay_ms = 0;
  std::uint32_t reset_time_ms = 0;
  std::uint32_t back_after_ms = 0;  // 0: a handset that hung up stays away
  std::uint32_t efs_blocks = 0;     // 0: as many as there are
  std::optional<std::uint32_t> efs_bad_offset;
  std::vector<std::pair<std::string, std::string>> efs_shown_names;
  std::vector<std::string> arrays;  // "3101:4", see ParseArray
  std::uint32_t flash_block = 0;    // 0: as the programmer has it
  std::uint16_t flash_window = 0;
  std::vector<std::string> faults;
  std::vector<std::string> faults_at;  // "3:lose,of=08": of one
  double bit_errors = 0;
  handset::LogTraffic traffic;
  std::uint64_t seed = 1;
  std::string link;
  bool boot_loader = false;
  std::string loader = "kova";
  std::optional<std::uint32_t> chip_identity;
};

// "250000", "250k", "1M": bytes a second; nothing for anything else.
std::optional<std::uint32_t> ParseRate(const std::string& text);

// "3101:4": a numbered item, and of how many elements it is.
std::optional<std::pair<std::uint16_t, std::uint8_t>> ParseArray(const std::string& text);

// One handset with its cable, numbered from 1.
class SimSocket {
 public:
  SimSocket(std::uint16_t number, const SimOptions& options);  // not connected yet

  void Connect(const SimOptions& options);
  void Watch();  // now and then: what hung up is plugged in again when its time has come

  std::uint16_t number() const { return number_; }
  handset::VirtualHandset& handset() { return handset_; }
  std::string device() const { return cable_->device_path(); }
  std::uint32_t serial_number() { return handset_.identity().identity().serial_number; }

 private:
  const std::uint16_t number_;
  const std::uint32_t back_after_ms_;
  handset::VirtualHandset handset_;
  std::unique_ptr<handset::PtyCable> cable_;
  std::optional<handset::LiveTraffic> traffic_;
  bool away_ = false;
  std::uint32_t away_since_ = 0;
};

class SimFixture {
 public:
  explicit SimFixture(const SimOptions& options);  // ToolError

  std::list<SimSocket>& sockets() { return sockets_; }

 private:
  std::list<SimSocket> sockets_;
};

}  // namespace kral::tool

#endif
