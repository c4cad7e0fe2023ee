// Sends requests in the frame of their family, and judges the replies by their definition.
#include "commands/defined/call.h"

#include <algorithm>
#include <utility>

#include "base/little_endian.h"
#include "commands/defined/definition_xml.h"
#include "commands/ftm/ftm_frame.h"
#include "commands/ftm/ftm_mode.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"
#include "platform/file_util.h"
#include "platform/xml_document.h"

namespace kral::defined {
namespace {

constexpr size_t kMostPrepared = 65536;

// The command code of one request; the handset's own is in force again behind it.
class WithCommandCode {
 public:
  WithCommandCode(Diag_FTM& phone, uint32_t code)
      : settings_(phone.state<ftm::Settings>()), before_(settings_.command_code) {
    settings_.command_code = code;
  }
  ~WithCommandCode() { settings_.command_code = before_; }
  WithCommandCode(const WithCommandCode&) = delete;
  WithCommandCode& operator=(const WithCommandCode&) = delete;

 private:
  ftm::Settings& settings_;
  const uint32_t before_;
};

// Appends the fields and sends. `header` is how many bytes stand in front of a reply's fields.
template <class Transmit>
bool Exchange(Diag_FTM& phone, const Command& command, std::span<const uint8_t> request, size_t header,
              std::span<const uint8_t>& reply, const Transmit& transmit) {
  const size_t most = CDiagPacket::kCapacity - 1 - phone.packet().request_length();
  if (request.size() > most) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the request of %s has %zu bytes and takes at most %zu",
                        command.name.c_str(), request.size(), most));
  }
  phone.packet().AppendBlock(request);
  if (!transmit()) return false;
  const auto response = phone.packet().response();
  reply = response.subspan(std::min(response.size(), header));
  return true;
}

bool ExchangeFtm(Diag_FTM& phone, const Command& command, std::span<const uint8_t> request,
                 std::span<const uint8_t>& reply) {
  const Framing& framing = command.framing;
  const bool by_rf_mode = framing.mode_rule == ModeRule::kByRfMode;
  const uint16_t rf_mode = by_rf_mode ? LoadLe<uint16_t>(request).value_or(0) : uint16_t{0};
  if (by_rf_mode && !ftm::ChooseModeId(phone, rf_mode)) return false;
  const auto current = static_cast<uint16_t>(phone.state<ftm::Settings>().mode_id);
  ftm::BeginCommand(phone, framing.mode_rule == ModeRule::kFixed ? framing.mode_id : current, framing.header,
                    command.id);
  const bool sent = Exchange(phone, command, request, ftm::HeaderSize(phone), reply,
                             [&] { return static_cast<bool>(ftm::Transmit(phone)); });
  if (by_rf_mode) ftm::WaitAfterMode(phone, rf_mode);
  return sent;
}

bool ExchangePlain(Diag_FTM& phone, const Command& command, std::span<const uint8_t> request,
                   std::span<const uint8_t>& reply, const auto& header, size_t header_size) {
  header.Begin(phone);
  return Exchange(phone, command, request, header_size, reply,
                  [&] { return static_cast<bool>(header.Transmit(phone, phone.TimeOut(kTimeOutDefaultCommand))); });
}

bool ExchangeFramed(Diag_FTM& phone, const Command& command, std::span<const uint8_t> request,
                    std::span<const uint8_t>& reply) {
  switch (command.framing.frame) {
    case Frame::kFtmLegacy: {
      const WithCommandCode legacy(phone, ftm::kCommandCode59);
      return ExchangeFtm(phone, command, request, reply);
    }
    case Frame::kDiagnostic:
      return ExchangePlain(phone, command, request, reply, DiagHeader{static_cast<uint8_t>(command.id)}, 1);
    case Frame::kSubsystem:
      return ExchangePlain(phone, command, request, reply, SubsystemHeader{command.framing.subsystem, command.id}, 4);
    default:
      return ExchangeFtm(phone, command, request, reply);
  }
}

// Handsets pad replies under the legacy code.
bool MayBePadded(Diag_FTM& phone, const Framing& framing) {
  if (framing.frame == Frame::kFtmLegacy) return true;
  return framing.frame == Frame::kFtm && phone.state<ftm::Settings>().command_code == ftm::kCommandCode59;
}

// The text has a status whole; one of more than 32 bits must not look like success here.
uint32_t StatusOf(Bits status) {
  const bool fits = status <= UINT32_MAX || SignExtended(status, 32) == status;
  return fits ? static_cast<uint32_t>(status) : UINT32_MAX;
}

bool TakeReply(Diag_FTM& phone, const std::shared_ptr<Call>& call, std::span<const uint8_t> reply) {
  const Command& command = *call->command;
  try {
    Decode(reply, call->reply, MayBePadded(phone, command.framing));
  } catch (const RefusedByStatus& refused) {
    return Fail(Failure(KRAL_ERROR_REFUSED, "the handset refused %s: %s", command.name.c_str(), refused.what())
                    .Status(KRAL_ERROR_STATUS_COMMAND, StatusOf(refused.status()))
                    .Command(phone.packet().request()));
  } catch (const BadCall& bad) {
    return Fail(Failure(KRAL_ERROR_LINK, "the reply of %s, %zu bytes, is not as defined: %s", command.name.c_str(),
                        reply.size(), bad.what())
                    .Command(phone.packet().request()));
  }
  call->answered = true;
  phone.state<Session>().last_call = call;
  return true;
}

// Bytes of a caller are held to the definition as texts are.
void CheckRequest(const Command& command, std::span<const uint8_t> request) {
  Values values(command.request);
  Decode(request, values);
  for (const Field* const field : command.request.slots) {
    const uint32_t end = values.Reach(field->slot, 0, field->capacity);
    for (uint32_t element = 0; field->is_number() && element < end; ++element) {
      if (const Bits* const value = values.Number(field->slot, element)) CheckRange(*field, *value);
    }
  }
}

}  // namespace

bool LoadDefinitions(Diag_FTM& phone, const std::string& file, uint32_t& count) {
  std::vector<uint8_t> document;
  if (const std::error_code error = ReadWholeFile(file, kXmlSizeLimit, document)) {
    return Fail(FileFailure(file, "cannot be read", static_cast<uint32_t>(error.value())));
  }
  std::vector<CommandPtr> commands;
  Problem problem;
  Definitions& definitions = phone.state<Session>().definitions;
  if (!ReadDefinitions(document, definitions, commands, problem)) {
    Failure failure = FileFailure(file, ("cannot be used: " + problem.text).c_str());
    return Fail(problem.line != 0 ? failure.Line(problem.line) : failure);
  }
  count = static_cast<uint32_t>(commands.size());
  definitions.Add(std::move(commands));
  return true;
}

CommandPtr FindCommand(Diag_FTM& phone, std::string_view name) {
  CommandPtr command = phone.state<Session>().definitions.Find(name);
  if (!command) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no command %.*s among the %zu that are defined",
                 static_cast<int>(std::min<size_t>(name.size(), 100)), name.data(),
                 phone.state<Session>().definitions.count()));
  }
  return command;
}

std::shared_ptr<Call> FindCall(Diag_FTM& phone, uint32_t number) {
  const auto& prepared = phone.state<Session>().prepared;
  const auto found = prepared.find(number);
  if (found != prepared.end()) return found->second;
  Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no prepared call %u", number));
  return nullptr;
}

bool Prepare(Diag_FTM& phone, std::string_view name, uint32_t& number) {
  CommandPtr command = FindCommand(phone, name);
  if (!command) return false;
  Session& session = phone.state<Session>();
  if (session.prepared.size() >= kMostPrepared) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there are %zu prepared calls, which were not released", kMostPrepared));
  }
  do {
    number = ++session.last_number;
  } while (number == 0 || session.prepared.contains(number));
  session.prepared.emplace(number, std::make_shared<Call>(std::move(command)));
  return true;
}

bool Send(Diag_FTM& phone, const std::shared_ptr<Call>& call) {
  std::vector<uint8_t> request;
  call->answered = false;
  try {
    request = Encode(call->request);
  } catch (const BadCall& bad) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s is not sent: %s", call->command->name.c_str(), bad.what()));
  }
  std::span<const uint8_t> reply;
  return ExchangeFramed(phone, *call->command, request, reply) && TakeReply(phone, call, reply);
}

bool SendBytes(Diag_FTM& phone, const std::shared_ptr<Call>& call, std::span<const uint8_t> request,
               std::span<const uint8_t>& reply) {
  try {
    CheckRequest(*call->command, request);
  } catch (const BadCall& bad) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s is not sent: its request of %zu bytes is not as defined: %s",
                        call->command->name.c_str(), request.size(), bad.what()));
  }
  return ExchangeFramed(phone, *call->command, request, reply) && TakeReply(phone, call, reply);
}

}  // namespace kral::defined
