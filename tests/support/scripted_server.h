// A phone server that does what a test tells it, and writes down what it is asked. Installing one sets server mode;
// at its end every handle is released and direct mode is back.
#ifndef KRAL_TESTS_SUPPORT_SCRIPTED_SERVER_H
#define KRAL_TESTS_SUPPORT_SCRIPTED_SERVER_H

#include "frame/orbt_server.h"
#include "handset/line/bytes.h"
#include "kral/connection.h"
#include "tests/support/test.h"

namespace kral::test {

class ScriptedServer {
 public:
  // Empty: no reply.
  using Answer = std::function<std::vector<uint8_t>(std::span<const uint8_t> request)>;

  ScriptedServer() {
    KRAL_SetLibraryMode(1);
    SetServerFactory({[this](const char* name) {
                        calls.push_back(std::string("make ") + name);
                        return std::make_unique<Proxy>(*this, name);
                      },
                      [this](const char* name, OrbtServer&) {
                        calls.push_back(std::string("make ") + name);
                        return std::make_unique<SoftwareDownload>();
                      }});
  }
  ~ScriptedServer() {
    KRAL_DisconnectAllServers();
    SetServerFactory({});
    KRAL_SetLibraryMode(0);
  }
  ScriptedServer(const ScriptedServer&) = delete;
  ScriptedServer& operator=(const ScriptedServer&) = delete;

  std::vector<std::string> TakeCalls() { return std::exchange(calls, {}); }

  std::vector<std::string> calls;
  bool connects = true;
  Answer answer = [](auto request) { return std::vector<uint8_t>(request.begin(), request.end()); };  // an echo
  std::function<void()> on_connect = [] {};                                                           // these may throw
  std::function<void()> on_unregister = [] {};
  std::vector<std::string> all_ports;
  std::vector<std::string> phone_ports;
  PacketListener* listener = nullptr;

 private:
  class Proxy final : public OrbtServer {
   public:
    Proxy(ScriptedServer& script, const char* name) : script_(script), name_(name) {}
    ~Proxy() override { script_.calls.push_back("end " + name_); }

    bool ConnectToPort(uint16_t port, uint32_t wait_ms) override {
      script_.calls.push_back("connect " + std::to_string(port) + " within " + std::to_string(wait_ms));
      script_.on_connect();
      return script_.connects;
    }
    bool SendRequest(std::span<const uint8_t> request, uint32_t time_out_ms, std::vector<uint8_t>& reply) override {
      script_.calls.push_back("send " + handset::HexText(request) + " within " + std::to_string(time_out_ms));
      reply = script_.answer(request);
      return !reply.empty();
    }
    void RegisterListener(PacketListener& listener) override {
      script_.calls.push_back("register");
      script_.listener = &listener;
    }
    void UnregisterListener(PacketListener& listener) override {
      script_.calls.push_back("unregister");
      script_.on_unregister();
      if (script_.listener == &listener) script_.listener = nullptr;
    }
    std::vector<std::string> AllPorts() override { return script_.all_ports; }
    std::vector<std::string> PortsWithPhone() override { return script_.phone_ports; }

   private:
    ScriptedServer& script_;
    const std::string name_;
  };
};

}  // namespace kral::test

#endif
