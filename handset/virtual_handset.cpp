// Runs the handset's side of the line: bytes to requests, requests to services, replies through the faults. What the
// replies say is the services' affair.
#include "handset/virtual_handset.h"

#include <algorithm>
#include <chrono>

#include "handset/line/wire_modes.h"
#include "handset/loaders/software_image.h"
#include "handset/services/rf_nv.h"

namespace kral::handset {

// Handed to handlers and wire modes, which run with the handset locked.
class VirtualHandset::HandsetWire final : public Wire {
 public:
  explicit HandsetWire(VirtualHandset& handset) : handset_(handset) {}

  void Send(ByteView payload, uint32_t delay_ms) override { handset_.EmitLocked(payload, true, delay_ms); }
  void Write(ByteView bytes, uint32_t delay_ms) override { handset_.EmitLocked(bytes, false, delay_ms); }
  void Enter(std::shared_ptr<WireMode> mode) override { handset_.next_mode_ = std::move(mode); }
  void Restart(uint32_t silent_ms) override { handset_.RestartLocked(silent_ms); }
  void HangUp() override { handset_.HangUp(); }
  void Reappear(std::shared_ptr<WireMode> mode, uint32_t linger_ms, uint32_t away_ms) override {
    const uint32_t leave_tick = handset_.clock_.TickMs() + linger_ms;
    handset_.journey_ = Journey{std::move(mode), leave_tick, leave_tick + away_ms};
    handset_.travelling_ = true;
  }
  Clock& clock() override { return handset_.clock_; }

 private:
  VirtualHandset& handset_;
};

VirtualHandset::VirtualHandset(Identity identity, Clock& clock)
    : clock_(clock),
      line_(clock),
      wire_(std::make_unique<HandsetWire>(*this)),
      nv_(std::make_shared<NvStore>(identity.serial_number)),
      efs_(std::make_shared<EfsService>()),
      logs_(std::make_shared<LogService>()),
      mode_service_(std::make_shared<OperatingMode>(*nv_, clock)),
      ftm_(std::make_shared<FtmService>(*mode_service_)),
      memory_(std::make_shared<Memory>()),
      maintenance_(std::make_shared<Maintenance>(identity.service_code)),
      programmer_(std::make_shared<FlashProgrammer>(flash_)),
      loader_(std::make_shared<KovaLoader>(*memory_, programmer_)),
      boot_loader_(std::make_shared<BootLoader>()) {
  ftm_->SetDispatcher(
      kRfNvModeId, [efs = efs_](uint16_t command, ByteView payload) { return CarryOutRfNv(*efs, command, payload); });
  identity_ = std::make_shared<IdentityService>(std::move(identity));
  for (const std::shared_ptr<Service>& service : std::initializer_list<std::shared_ptr<Service>>{
           identity_, nv_, efs_, logs_, mode_service_, ftm_, memory_, maintenance_}) {
    AddServiceLocked(service);
  }
  mode_service_->SetLoader(loader_);
  boot_loader_->SetProgrammer(programmer_);
}

VirtualHandset::~VirtualHandset() = default;

bool VirtualHandset::FromHost(ByteView bytes) {
  Travel();
  const std::lock_guard lock(mutex_);
  if (vanished_) return false;
  if (keep_trace_) received_.insert(received_.end(), bytes.begin(), bytes.end());
  while (!bytes.empty() && !vanished_) {
    const size_t taken = mode_ ? std::min(mode_->OnBytes(bytes, *wire_), bytes.size()) : ReadDiagnosticLocked(bytes);
    bytes = bytes.subspan(taken);
    // A mode that neither takes bytes nor leaves has lost them.
    if (!SwitchModeLocked() && taken == 0) break;
  }
  return true;
}

size_t VirtualHandset::ToHost(std::span<uint8_t> buffer) {
  Travel();
  return vanished_ ? 0 : line_.Take(buffer);
}

void VirtualHandset::HangUp() {
  vanished_ = true;
  line_.Clear();
}

void VirtualHandset::PlugIn() {
  const std::lock_guard lock(mutex_);
  PlugInLocked(start_mode_);
}

void VirtualHandset::PlugInLocked(std::shared_ptr<WireMode> mode) {
  journey_.reset();
  travelling_ = false;
  if (vanished_) ++appearances_;
  vanished_ = false;
  line_.Clear();
  next_mode_ = std::move(mode);
  SwitchModeLocked();
}

void VirtualHandset::Restart() {
  const std::lock_guard lock(mutex_);
  ResetLocked();
  PlugInLocked(start_mode_);
}

// What was downloaded is what runs from here on.
void VirtualHandset::ResetLocked() {
  for (const auto& service : services_) service->OnReset();
  const auto revision = SoftwareRevision(flash_);
  if (!revision) return;
  Identity identity = identity_->identity();
  identity.software_revision = *revision;
  identity_->Set(std::move(identity));
  start_mode_ = nullptr;
}

bool VirtualHandset::vanished() {
  Travel();
  return vanished_;
}

// Nothing here has a thread of its own: the way is gone when somebody looks at the port.
void VirtualHandset::Travel() {
  if (!travelling_) return;
  const std::lock_guard lock(mutex_);
  if (!journey_) return;
  const auto is_due = [now = clock_.TickMs()](uint32_t tick) { return static_cast<int32_t>(now - tick) >= 0; };
  if (!journey_->left && is_due(journey_->leave_tick)) {
    journey_->left = true;
    HangUp();
  }
  if (journey_->left && is_due(journey_->return_tick)) PlugInLocked(journey_->mode);
}

uint32_t VirtualHandset::MillisecondsToOutput() const {
  const uint32_t next = line_.MillisecondsToNext();
  const std::lock_guard lock(mutex_);
  if (!journey_ || journey_->left) return next;
  const uint32_t to_leaving = journey_->leave_tick - clock_.TickMs();
  return static_cast<int32_t>(to_leaving) <= 0 ? 0 : std::min(next, to_leaving);
}

void VirtualHandset::On(uint8_t code, Length length, Handler handler) {
  const std::lock_guard lock(mutex_);
  table_.On(code, length, std::move(handler));
}

void VirtualHandset::OnSubsystem(uint8_t subsystem, uint16_t command, Length length, Handler handler) {
  const std::lock_guard lock(mutex_);
  table_.OnSubsystem(subsystem, command, length, std::move(handler));
}

void VirtualHandset::LoadCommands(const std::string& path) {
  defined_->Load(path, *ftm_);
  AddService(defined_);
}

void VirtualHandset::AddService(std::shared_ptr<Service> service) {
  const std::lock_guard lock(mutex_);
  AddServiceLocked(std::move(service));
}

void VirtualHandset::EnterMode(std::shared_ptr<WireMode> mode) {
  const std::lock_guard lock(mutex_);
  next_mode_ = std::move(mode);
  SwitchModeLocked();
}

void VirtualHandset::SetStartMode(std::shared_ptr<WireMode> mode) {
  const std::lock_guard lock(mutex_);
  start_mode_ = std::move(mode);
}

void VirtualHandset::SendPacket(ByteView payload) {
  SendUnframed(EncodeFrame(payload));
}

void VirtualHandset::SendUnframed(ByteView bytes) {
  if (vanished_) return;
  Outgoing outgoing;
  outgoing.bytes.assign(bytes.begin(), bytes.end());
  faults_.AddBitErrors(outgoing.bytes);
  line_.Queue(std::move(outgoing));
}

std::vector<Bytes> VirtualHandset::requests() const {
  const std::lock_guard lock(mutex_);
  return requests_;
}

Bytes VirtualHandset::received() const {
  const std::lock_guard lock(mutex_);
  return received_;
}

uint64_t VirtualHandset::request_count() const {
  const std::lock_guard lock(mutex_);
  return request_count_;
}

uint64_t VirtualHandset::damaged_frames() const {
  const std::lock_guard lock(mutex_);
  return decoder_.damaged();
}

bool VirtualHandset::WaitForRequests(uint64_t count, uint32_t milliseconds) const {
  std::unique_lock lock(mutex_);
  return heard_.wait_for(lock, std::chrono::milliseconds(milliseconds), [&] { return request_count_ >= count; });
}

void VirtualHandset::ClearTrace() {
  const std::lock_guard lock(mutex_);
  requests_.clear();
  received_.clear();
}

void VirtualHandset::KeepTrace(bool keep) {
  const std::lock_guard lock(mutex_);
  keep_trace_ = keep;
}

void VirtualHandset::OnRequestLocked(ByteView request) {
  ++request_count_;
  if (keep_trace_) requests_.emplace_back(request.begin(), request.end());
  heard_.notify_all();
  line_.OnRequest();

  strike_ = faults_.Select(request);
  std::vector<ScriptedReply> replies;
  if (strike_->Has(Fault::Kind::kHangUp)) {
    HangUp();
  } else if (const Fault* refusal = strike_->Find(Fault::Kind::kRefuse)) {
    Refuse(static_cast<Refusal>(refusal->value), request, *wire_);
  } else if (!strike_->Has(Fault::Kind::kIgnore)) {
    switch (script_.Match(request, replies)) {
      case Script::Outcome::kNoScript:
        table_.Answer(request, *wire_);
        break;
      case Script::Outcome::kMatched:
        for (const ScriptedReply& reply : replies) EmitLocked(reply.bytes, reply.framed, 0);
        break;
      case Script::Outcome::kMismatch:
        // Refused rather than left to time out, so that the test fails at once.
        Refuse(Refusal::kBadCommand, request, *wire_);
        break;
    }
  }
  strike_.reset();
}

size_t VirtualHandset::ReadDiagnosticLocked(ByteView bytes) {
  std::optional<Bytes> payload;
  const size_t taken = decoder_.Feed(bytes, payload);
  if (payload) OnRequestLocked(*payload);
  return taken;
}

bool VirtualHandset::SwitchModeLocked() {
  const bool switched = next_mode_.has_value();
  while (next_mode_) {
    mode_ = std::move(*next_mode_);
    next_mode_.reset();
    decoder_.Reset();
    if (mode_) mode_->OnEnter(*wire_);
  }
  return switched;
}

void VirtualHandset::RestartLocked(uint32_t silent_ms) {
  ResetLocked();
  next_mode_ = silent_ms == 0 || start_mode_ ? start_mode_ : std::make_shared<SilentMode>(clock_.TickMs() + silent_ms);
}

void VirtualHandset::EmitLocked(ByteView bytes, bool framed, uint32_t delay_ms) {
  if (vanished_) return;
  // In a wire mode there are no requests, so every packet is weighed by itself.
  const Strike strike = strike_ ? *strike_ : faults_.Select(bytes);
  if (strike.Has(Fault::Kind::kHangUp)) return HangUp();
  if (!strike_ && strike.Has(Fault::Kind::kIgnore)) return;
  for (Outgoing& outgoing : faults_.Deliver(strike, bytes, framed, delay_ms)) line_.Queue(std::move(outgoing));
}

void VirtualHandset::AddServiceLocked(std::shared_ptr<Service> service) {
  service->Register(table_);
  services_.push_back(std::move(service));
}

}  // namespace kral::handset
