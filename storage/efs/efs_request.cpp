// Sends single EFS2 requests. What they ask for and what their replies say is the business of the operations.
#include "storage/efs/efs_request.h"

#include <algorithm>
#include <utility>

#include "base/text_argument.h"
#include "storage/efs/efs_strays.h"

namespace kral::efs {
namespace {

constexpr const char* kTooShort = "is too short";

// What stands in front of the path.
struct KnownError {
  u32 number;
  const char* phrase;
};
constexpr KnownError kErrors[] = {
    {kMissing, "no such file"},
    {kExists, "there is already a file"},
    {kBadDescriptor, "the handset has no open handle of"},
    {13, "no permission for"},
    {20, "a part of the path is no folder:"},
    {21, "a folder and not a file:"},
    {22, "the handset finds something invalid about"},
    {24, "too many files are open for"},
    {27, "too large for the handset:"},
    {kNoRoom, "no room on the handset for"},
    {36, "a name is too long in"},
    {39, "the folder is not empty:"},
    {40, "too many links in"},
};

bool IsOwnReply(std::span<const u8> request, std::span<const u8> reply, const ReplyTest& is_own) {
  return reply.size() >= kHeaderSize && std::equal(request.begin(), request.begin() + kHeaderSize, reply.begin()) &&
         (!is_own || is_own(reply));
}

// While an EFS2 request is under way the engine heeds the abort.
class RequestScope {
 public:
  explicit RequestScope(Diag_FTM& phone) : phone_(phone) {
    if (phone.server_mode()) return;  // there is no transport of ours
    former_ = phone.transport().SetAbort(phone.state<Settings>().heeded_abort());
  }
  ~RequestScope() {
    if (!phone_.server_mode()) phone_.transport().SetAbort(former_);
  }
  RequestScope(const RequestScope&) = delete;
  RequestScope& operator=(const RequestScope&) = delete;

 private:
  Diag_FTM& phone_;
  const std::atomic<bool>* former_ = nullptr;
};

bool HasAbort(Diag_FTM& phone) {
  const std::atomic<bool>* const abort = phone.state<Settings>().heeded_abort();
  return abort != nullptr && *abort;
}

void CloseStrays(Diag_FTM& phone, const EfsRequest<u32>& close, OpenHandles& handles) {
  for (const u32 value : std::exchange(handles.strays, {})) {
    phone.log().WriteLine(kLogRet, "EFS2 handle %u was opened by a request given up, and is closed", value);
    const KeepFailure keep;
    const bool closed = CloseHandle(phone, close, value, DefaultTimeOut(phone), true);
    // After an abort a silent handset is not waited for: it is told with the next operation.
    if (!closed && phone.state<Settings>().gave_up) handles.strays.push_back(value);
  }
}

}  // namespace

Path PathField(const char* path) {
  if (path == nullptr) path = "";
  // A path beyond every limit is cut to one that still is, so that its request is refused rather than sent without it.
  size_t size = 0;
  while (size < kLongestGetRequest && path[size] != '\0') ++size;
  return {reinterpret_cast<const u8*>(path), size < kLongestGetRequest ? size + 1 : size};
}

std::optional<std::string> TextAt(std::span<const u8> reply, size_t offset) {
  if (offset >= reply.size()) return std::nullopt;
  const auto rest = reply.subspan(offset);
  const auto end = std::ranges::find(rest, u8{0});
  if (end == rest.end()) return std::nullopt;
  return std::string(rest.begin(), end);
}

bool IsWithinLimit(Diag_FTM& phone) {
  const size_t size = phone.packet().request_length();
  if (size <= kLongestRequest) return true;
  phone.log().WriteLine(kLogErr, "EFS2 request of %d bytes not sent: its path is too long", static_cast<int>(size));
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "the path is too long: a request of %zu bytes", size));
}

Reply ExchangePacket(Diag_FTM& phone, CDiagPacket& packet, u32 time_out_ms, const ReplyTest& is_own) {
  if (IsAborted(phone, "request")) {
    packet.set_response_length(0);
    return ReplyKind::kAborted;
  }
  const RequestScope scope(phone);
  if (const Reply synchronised = phone.Synchronise(time_out_ms); !synchronised) {
    packet.set_response_length(0);
    return synchronised;
  }
  const u32 start = phone.clock().TickMs();
  const ReplyTest own = [&](std::span<const u8> reply) {
    if (IsOwnReply(packet.request(), reply, is_own)) return true;
    phone.log().WriteLine(kLogErr, "EFS2 reply belongs to another request");
    return false;
  };
  Reply reply = phone.Send(packet, time_out_ms, 0, own);
  // A reply with another first byte ends a request of the engine; here it may be late as well, and ours behind it.
  const auto is_for_another = [&] {
    return reply.kind() == ReplyKind::kOther && (reply.refusal() == 0 || RefusesAnother(reply, packet.request()));
  };
  while (is_for_another()) {
    phone.log().WriteLine(kLogErr, "EFS2 reply belongs to another request");
    const u32 elapsed = phone.clock().TickMs() - start;
    if (elapsed >= time_out_ms) break;  // of a handset that never stops talking
    if (IsAborted(phone, "request")) {
      reply = ReplyKind::kAborted;
      break;
    }
    const Reply other(reply.kind(), reply.code(), {});
    reply = phone.AwaitNext(packet, time_out_ms - elapsed, own);
    // Where nothing more comes, that was the answer.
    if (reply.kind() == ReplyKind::kNone) Fail(RequestFailure(phone, other, packet.request(), time_out_ms));
  }
  if (reply.kind() == ReplyKind::kAborted) phone.state<Settings>().gave_up = true;
  return reply;
}

Reply ExchangeOnce(Diag_FTM& phone, u32 time_out_ms, const ReplyTest& is_own) {
  const Reply reply = ExchangePacket(phone, phone.packet(), time_out_ms, is_own);
  CloseStrays(phone);
  return reply;
}

Reply ExchangeUntil(Diag_FTM& phone, u32 time_out_ms, const ReplyTest& is_own, const ReplyTest& accepts, int tries) {
  Reply reply;
  for (int attempt = 0; attempt < tries; ++attempt) {
    // With a handset that is silent, an abort would otherwise wait for every try.
    if (attempt > 0 && IsAborted(phone, "request")) return ReplyKind::kAborted;
    reply = Checked(ExchangeOnce(phone, time_out_ms, is_own), [&] { return accepts(phone.packet().response()); });
    if (reply || reply.kind() == ReplyKind::kGone) break;
  }
  return reply;
}

Reply AskComposed(Diag_FTM& phone, Tries tries) {
  const u32 time_out_ms = DefaultTimeOut(phone);
  if (tries == Tries::kOne) return ExchangeOnce(phone, time_out_ms);
  return ExchangeUntil(phone, time_out_ms, {}, [](std::span<const u8>) { return true; });
}

Transfer::Transfer(Diag_FTM& phone) : settings_(phone.state<Settings>()) {
  settings_.in_transfer = true;
  settings_.abort = settings_.in_job && settings_.job_abort;
  settings_.gave_up = settings_.gave_up && settings_.abort;
}

Transfer::~Transfer() {
  settings_.in_transfer = false;
}

Reply ExchangeToCleanUp(Diag_FTM& phone, CDiagPacket& packet, u32 time_out_ms) {
  if (!HasAbort(phone)) return ExchangePacket(phone, packet, time_out_ms);
  Settings& settings = phone.state<Settings>();
  const u32 moment_ms = settings.gave_up ? 50 : 150;  // of a handset that has been silent before, or has not
  const auto request = packet.request();
  const auto is_own = [&](std::span<const u8> reply) { return IsOwnReply(request, reply, {}); };
  // Without a loopback in front: unanswered, it would keep the request from being sent.
  const Reply reply =
      phone.SendSync(request, packet.response_area(), request[0], std::min(time_out_ms, moment_ms), 0, is_own);
  packet.set_response_length(static_cast<u16>(reply.bytes().size()));
  if (!reply.came()) settings.gave_up = true;
  return reply;
}

int CleanUpTries(Diag_FTM& phone) {
  return HasAbort(phone) ? 1 : kTries;
}

bool IsAborted(Diag_FTM& phone, const char* operation) {
  if (!HasAbort(phone)) return false;
  phone.log().WriteLine(kLogErr, "EFS %s aborted", operation);
  Fail(Failure(KRAL_ERROR_ABORTED, "the %s was aborted", operation));
  return true;
}

bool ReadFromEnd(Diag_FTM& phone, std::initializer_list<u32*> fields) {
  CDiagPacket& packet = phone.packet();
  if (packet.response_length() < kHeaderSize + fields.size() * sizeof(u32)) return Fail(BadReply(phone, kTooShort));
  return std::ranges::all_of(fields, [&](u32* field) { return packet.Read32(*field); });
}

bool ReadAt(Diag_FTM& phone, size_t offset, u32& field) {
  return phone.packet().ResponseAt32(offset, field) || Fail(BadReply(phone, kTooShort));
}

bool IsDone(u32 error, const char* path) {
  if (error == kDone) return true;
  const auto* const known =
      std::ranges::find_if(kErrors, [error](const KnownError& row) { return row.number == error; });
  const Failure failure =
      known == std::end(kErrors)
          ? Failure(KRAL_ERROR_REFUSED, "the handset gives error %u for %s", error, TextOrEmpty(path))
          : Failure(KRAL_ERROR_REFUSED, "%s %s", known->phrase, TextOrEmpty(path));
  return Fail(Failure(failure).Status(KRAL_ERROR_STATUS_EFS, error));
}

bool Contradicts(Diag_FTM& phone) {
  return Fail(BadReply(phone, "contradicts itself or the request"));
}

void CloseStrays(Diag_FTM& phone) {
  Settings& settings = phone.state<Settings>();
  CloseStrays(phone, kClose, settings.files);
  CloseStrays(phone, kCloseDirectory, settings.directories);
}

bool CloseHandle(Diag_FTM& phone, const EfsRequest<u32>& close, u32 value, u32 time_out_ms, bool may_be_closed) {
  CDiagPacket& packet = phone.packet(kSidePacket);
  packet.Reset();
  packet.Append8(kSubsystemDispatch);
  packet.Append8(close.header.subsystem);
  packet.Append16(close.header.command);
  packet.Append32(value);
  bool unanswered = may_be_closed;
  for (int attempt = 0; attempt < CleanUpTries(phone); ++attempt) {
    u32 error = 0;
    const Reply reply = Checked(ExchangeToCleanUp(phone, packet, time_out_ms), [&] {
      return packet.ResponseAt32(kErrorBehindHeader, error) ||
             Fail(Failure(KRAL_ERROR_LINK, "the reply to the closing of a handle is too short"));
    });
    if (!reply) {
      unanswered = true;
      continue;
    }
    // A handset that does not know the handle any more has closed it on a try whose answer was lost.
    if (IsDone(error, "what is to be closed") || (unanswered && error == kBadDescriptor)) return true;
  }
  phone.log().WriteLine(kLogErr, "EFS2 handle %u could not be closed", value);
  return false;
}

}  // namespace kral::efs
