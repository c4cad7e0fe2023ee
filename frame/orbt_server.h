// The phone server of the phone service tool, as the library sees it in server mode.
//
// The server itself is reached through its own COM interface, which a station's integration supplies by installing a
// factory; without one there is no server, connects return their handle and every request gives 0.
#ifndef KRAL_FRAME_ORBT_SERVER_H
#define KRAL_FRAME_ORBT_SERVER_H

#include <atomic>
#include <cstdint>
#include <exception>
#include <functional>
#include <map>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "frame/efs_server.h"
#include "transport/line/packet_listener.h"

namespace kral {

// What a server call throws when the server fails; caught and logged inside the library.
class OrbtServerException : public std::exception {
 public:
  const char* what() const noexcept override { return "phone server exception"; }
};

class OrbtServer {
 public:
  virtual ~OrbtServer() = default;

  virtual bool ConnectToPort(uint16_t port, uint32_t wait_ms) = 0;
  // True when a reply arrived; it is the de-framed packet without FCS bytes.
  virtual bool SendRequest(std::span<const uint8_t> request, uint32_t time_out_ms, std::vector<uint8_t>& reply) = 0;
  virtual void RegisterListener(PacketListener& listener) = 0;
  virtual void UnregisterListener(PacketListener& listener) = 0;

  // Port names with a three-letter prefix, such as COM12.
  virtual std::vector<std::string> AllPorts() = 0;
  virtual std::vector<std::string> PortsWithPhone() = 0;
};

// Whole download jobs handed to the phone server; keeps the time-outs of identifier 20 and above, and how the server is
// to answer the hellos of boot loaders.
class SoftwareDownload {
 public:
  virtual ~SoftwareDownload() = default;

  // PKV files to and from the handset, by the server's download agent. They may throw OrbtServerException.
  virtual bool UploadPkvFile(const std::string& /*file*/, uint32_t /*options*/) { return false; }
  virtual bool DownloadPkvFile(const std::string& /*file*/, uint32_t /*options*/) { return false; }

  bool ConfigureTimeOut(uint32_t id, int32_t milliseconds);
  int32_t GetTimeOut(uint32_t id) const;
  // Overridden by what talks to a server, to pass the value on.
  virtual void SetKivratHelloBehavior(uint16_t behavior) { kivrat_hello_behavior_ = behavior; }
  uint16_t kivrat_hello_behavior() const { return kivrat_hello_behavior_; }

 private:
  mutable Mutex mutex_;
  std::map<uint32_t, int32_t> time_outs_ KRAL_GUARDED_BY(mutex_);
  std::atomic<uint16_t> kivrat_hello_behavior_{0};
};

struct ServerFactory {
  std::function<std::unique_ptr<OrbtServer>(const char* name)> make_server;
  std::function<std::unique_ptr<SoftwareDownload>(const char* name, OrbtServer& server)> make_software_download;
  std::function<std::unique_ptr<EfsServer>(const char* name)> make_efs_server = {};
};

// Library-wide; empty functions mean that there is no server.
void SetServerFactory(ServerFactory factory);
ServerFactory CurrentServerFactory();

}  // namespace kral

#endif
