// The target's side of the boot transfer: it leads, asks, and stops listening at the host's first mistake.
#include "handset/loaders/boot_loader.h"

#include <algorithm>

namespace kral::handset {
namespace {

constexpr uint32_t kHello = 1;
constexpr uint32_t kHelloResponse = 2;
constexpr uint32_t kReadData = 3;
constexpr uint32_t kEndOfTransfer = 4;
constexpr uint32_t kDone = 5;
constexpr uint32_t kDoneResponse = 6;
constexpr uint32_t kCommandReady = 11;
constexpr uint32_t kSwitchMode = 12;
constexpr uint32_t kExecute = 13;
constexpr uint32_t kExecuteResponse = 14;
constexpr uint32_t kExecuteData = 15;

constexpr uint32_t kImageTransferMode = 0;
constexpr uint32_t kCommandMode = 3;
constexpr uint32_t kReadChipIdentity = 2;

constexpr size_t kLongestIdentity = 24;
constexpr uint32_t kLongestPacket = 1024;

constexpr std::string_view kProgrammerMark = "VHFP";

Bytes Packet(uint32_t command, std::initializer_list<uint32_t> fields) {
  ByteWriter writer;
  writer.U32(command).U32(static_cast<uint32_t>(8 + 4 * fields.size()));
  for (const uint32_t field : fields) writer.U32(field);
  return writer.Take();
}

}  // namespace

void BootLoader::OnEnter(Wire& wire) {
  const std::lock_guard lock(mutex_);
  SayHello(wire);
}

void BootLoader::SetProgrammer(std::shared_ptr<WireMode> programmer) {
  const std::lock_guard lock(mutex_);
  programmer_ = std::move(programmer);
}

void BootLoader::Set(BootLoaderSettings settings) {
  const std::lock_guard lock(mutex_);
  settings_ = settings;
}

Bytes BootLoader::image() const {
  const std::lock_guard lock(mutex_);
  return image_;
}

bool BootLoader::transferred() const {
  const std::lock_guard lock(mutex_);
  return state_ == State::kOver && problem_.empty() && status_ == kStatusDone && !image_.empty();
}

std::string BootLoader::problem() const {
  const std::lock_guard lock(mutex_);
  return problem_;
}

void BootLoader::SayHello(Wire& wire) {
  state_ = State::kHello;
  packet_.clear();
  image_.clear();
  requested_ = 0;
  status_ = kStatusDone;
  problem_.clear();
  hello_ = Packet(kHello, {settings_.version, settings_.compatible_version, settings_.longest_command,
                           kImageTransferMode, 1, 2, 3, 4, 5, 6});
  wire.Write(hello_);
}

size_t BootLoader::OnBytes(ByteView bytes, Wire& wire) {
  const std::lock_guard lock(mutex_);
  if (state_ == State::kOver) return bytes.size();
  return requested_ > 0 ? TakeImage(bytes, wire) : TakePacket(bytes, wire);
}

size_t BootLoader::TakeImage(ByteView bytes, Wire& wire) {
  const size_t taken = std::min(bytes.size(), requested_);
  image_.insert(image_.end(), bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(taken));
  requested_ -= taken;
  if (requested_ == 0) OnImage(wire);
  return taken;
}

// Packets may come in pieces, or several at once.
size_t BootLoader::TakePacket(ByteView bytes, Wire& wire) {
  size_t taken = 0;
  while (taken < bytes.size()) {
    packet_.push_back(bytes[taken++]);
    if (packet_.size() < 8) continue;
    const uint32_t length = GetU32(packet_, 4);
    if (length < 8 || length > kLongestPacket) {
      Fail("a packet of an impossible length", packet_);
    } else if (packet_.size() == length) {
      const Bytes whole = std::move(packet_);
      packet_.clear();
      OnPacket(whole, wire);
    } else {
      continue;
    }
    break;
  }
  return taken;
}

void BootLoader::OnPacket(ByteView packet, Wire& wire) {
  switch (state_) {
    case State::kHello:
      return OnHelloResponse(packet, wire);
    case State::kCommand:
      return OnCommand(packet, wire);
    case State::kEnd:
      if (!std::ranges::equal(packet, Packet(kDone, {}))) return Fail("a packet that is not the done", packet);
      state_ = State::kOver;
      wire.Write(Packet(kDoneResponse, {status_}));
      if (status_ == kStatusDone && programmer_) wire.Enter(programmer_);
      return;
    default:
      return Fail("a packet that was not asked for", packet);
  }
}

void BootLoader::OnHelloResponse(ByteView packet, Wire& wire) {
  const uint32_t mode = GetU32(packet, 20);
  Bytes expected = hello_;
  expected[0] = kHelloResponse;
  std::fill_n(expected.begin() + 16, 4, uint8_t{0});
  expected[20] = static_cast<uint8_t>(mode);
  if (!std::ranges::equal(packet, expected)) return Fail("a hello response that does not echo the hello", packet);
  if (mode == kCommandMode) {
    state_ = State::kCommand;
    wire.Write(Packet(kCommandReady, {}));
  } else if (mode == kImageTransferMode) {
    state_ = State::kImage;
    Request(wire, kProgrammerHeader);
  } else {
    Fail("a hello response with an unknown mode", packet);
  }
}

void BootLoader::OnCommand(ByteView packet, Wire& wire) {
  if (std::ranges::equal(packet, Packet(kExecute, {kReadChipIdentity}))) {
    wire.Write(Packet(kExecuteResponse, {kReadChipIdentity, settings_.identity_size}));
  } else if (std::ranges::equal(packet, Packet(kExecuteData, {kReadChipIdentity}))) {
    Bytes data = ByteWriter().U32(1).U32(settings_.chip_identity).U32(2).U32(3).U32(4).U32(5).Take();
    data.resize(std::min<size_t>(settings_.identity_size, kLongestIdentity));
    wire.Write(data);
  } else if (std::ranges::equal(packet, Packet(kSwitchMode, {kImageTransferMode}))) {
    SayHello(wire);
  } else {
    Fail("an unknown command", packet);
  }
}

void BootLoader::OnImage(Wire& wire) {
  const bool known = std::equal(kProgrammerMark.begin(), kProgrammerMark.end(), image_.begin());
  const size_t size = GetU32(image_, kProgrammerMark.size());
  if (!known || size < image_.size()) return EndTransfer(wire, kStatusBadImage);
  if (size == image_.size()) return EndTransfer(wire, kStatusDone);
  Request(wire, static_cast<uint32_t>(std::min<size_t>(size - image_.size(), std::max(settings_.piece_size, 1u))));
}

void BootLoader::Request(Wire& wire, uint32_t size) {
  requested_ = size;
  wire.Write(Packet(kReadData, {settings_.image_id, static_cast<uint32_t>(image_.size()), size}));
}

void BootLoader::EndTransfer(Wire& wire, uint32_t status) {
  status_ = status;
  state_ = State::kEnd;
  wire.Write(Packet(kEndOfTransfer, {settings_.image_id, status}));
}

void BootLoader::Fail(std::string what, ByteView packet) {
  problem_ = std::move(what) + ":\n" + HexDump(packet);
  state_ = State::kOver;
  requested_ = 0;
}

Bytes MakeProgrammer(size_t size) {
  Bytes programmer(kProgrammerMark.begin(), kProgrammerMark.end());
  const Bytes length = ByteWriter().U32(static_cast<uint32_t>(size)).Take();
  programmer.insert(programmer.end(), length.begin(), length.end());
  for (size_t i = programmer.size(); i < size; ++i) programmer.push_back(static_cast<uint8_t>(i * 7 + (i >> 8)));
  return programmer;
}

}  // namespace kral::handset
