// Calls of defined commands: their definitions and prepared calls, kept for each handset, and the exchange itself.
#ifndef KRAL_COMMANDS_DEFINED_CALL_H
#define KRAL_COMMANDS_DEFINED_CALL_H

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <unordered_map>
#include <vector>

#include "commands/defined/definition.h"
#include "commands/defined/values.h"

namespace kral {

class Diag_FTM;

namespace defined {

// A command with the values of a request, and those of the reply to it.
struct Call {
  explicit Call(CommandPtr called) : command(std::move(called)), request(command->request), reply(command->reply) {}

  CommandPtr command;  // stays, also when the definitions are cleared
  Values request;
  Values reply;
  bool answered = false;
};

// What a handset keeps, under its request lock.
struct Session {
  Definitions definitions;
  std::unordered_map<uint32_t, std::shared_ptr<Call>> prepared;
  uint32_t last_number = 0;         // of a prepared call
  std::shared_ptr<Call> last_call;  // that was answered
};

// These note a failure and give false, or null. A file with a fault adds nothing.
bool LoadDefinitions(Diag_FTM& phone, const std::string& file, uint32_t& count);
CommandPtr FindCommand(Diag_FTM& phone, std::string_view name);
std::shared_ptr<Call> FindCall(Diag_FTM& phone, uint32_t number);
bool Prepare(Diag_FTM& phone, std::string_view name, uint32_t& number);

// Sends the values of the request, once, and takes those of the reply.
bool Send(Diag_FTM& phone, const std::shared_ptr<Call>& call);
// Sends the bytes behind the header, which must be a request of the command; `reply` is what stands behind the reply's.
bool SendBytes(Diag_FTM& phone, const std::shared_ptr<Call>& call, std::span<const uint8_t> request,
               std::span<const uint8_t>& reply);

}  // namespace defined
}  // namespace kral

#endif
