// Replies that tell who the handset is.
#include "handset/services/identity.h"

namespace kral::handset {
namespace {

constexpr uint8_t kVersion = 0;
constexpr uint8_t kLoopback = 123;
constexpr uint8_t kExtendedBuildId = 124;
constexpr uint8_t kServiceCheckSubsystem = 50;
constexpr uint16_t kServiceCheck = 3;

constexpr size_t kDateSize = 11;
constexpr size_t kTextSize = 8;

}  // namespace

void IdentityService::Register(RequestTable& table) {
  table.On(kVersion, Length::Exactly(1), [this](ByteView, Wire& wire) { wire.Send(VersionReply()); });
  table.On(kExtendedBuildId, Length::Exactly(1), [this](ByteView, Wire& wire) { wire.Send(BuildIdReply()); });
  table.On(kLoopback, Length::AtLeast(1), [](ByteView request, Wire& wire) { wire.Send(request); });
  // Answered as it came, like loopback, by the service that dispatches diagnostics to applications.
  table.OnSubsystem(kServiceCheckSubsystem, kServiceCheck, Length::AtLeast(4),
                    [](ByteView request, Wire& wire) { wire.Send(request); });
}

Identity IdentityService::identity() const {
  const std::lock_guard lock(mutex_);
  return identity_;
}

void IdentityService::Set(Identity identity) {
  const std::lock_guard lock(mutex_);
  identity_ = std::move(identity);
}

void IdentityService::SetVersionReplySize(size_t size) {
  const std::lock_guard lock(mutex_);
  version_reply_size_ = size;
}

Bytes IdentityService::VersionReply() const {
  const std::lock_guard lock(mutex_);
  Bytes reply = ByteWriter()
                    .U8(kVersion)
                    .Characters(identity_.compile_date, kDateSize)
                    .Characters(identity_.compile_time, kTextSize)
                    .Characters(identity_.release_date, kDateSize)
                    .Characters(identity_.release_time, kTextSize)
                    .Characters(identity_.version_directory, kTextSize)
                    .U8(identity_.station_class_mark)
                    .U8(identity_.air_interface_revision)
                    .U8(identity_.mobile_model)
                    .U16(identity_.firmware_revision)
                    .U8(identity_.slot_cycle_index)
                    .U8(identity_.vocoder_major)
                    .U8(identity_.vocoder_minor)
                    .Take();
  if (version_reply_size_ != 0 && version_reply_size_ < reply.size()) reply.resize(version_reply_size_);
  return reply;
}

Bytes IdentityService::BuildIdReply() const {
  const std::lock_guard lock(mutex_);
  return ByteWriter()
      .U8(kExtendedBuildId)
      .U8(0)
      .U16(0)
      .U32(identity_.hardware_version)
      .U32(identity_.extended_model)
      .Terminated(identity_.software_revision)
      .Terminated(identity_.model)
      .Take();
}

}  // namespace kral::handset
