// A handset that answers the file-system requests with whatever it likes. Outputs stay within their room, and change on
// success only; every descriptor and directory handle that was given away is asked to be closed.
//
// Byte 0 chooses the operation, the answers are the parts behind it: bit 0 repeats the request's header, bit 1 the
// fields by which an answer is recognised behind it. Requests beyond the last answer are refused.
#include <algorithm>
#include <cstring>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "fuzz/lying_handset.h"
#include "fuzz/support.h"
#include "kral/efs.h"
#include "storage/efs/efs_settings.h"

namespace {

using namespace kral;
using fuzz::Bytes;
using fuzz::ByteView;
using fuzz::Require;

constexpr uint8_t kSubsystem = 19;
constexpr uint16_t kLastCommand = 53;
constexpr uint8_t kRefusal = 19;
constexpr int32_t kTimeOutMs = 2000;  // every request is answered

class LyingFiles {
 public:
  explicit LyingFiles(ByteView answers) : answers_(answers) {
    for (uint16_t command = 0; command <= kLastCommand; ++command) {
      lying_.phone().OnSubsystem(kSubsystem, command, {}, [this](ByteView request, handset::Wire& wire) {
        const Bytes answer = Answer(request);
        Note(request, answer);
        wire.Send(answer);
        // The right answer is waited for behind a foreign one: it is a refusal.
        if (answer.front() != kRefusal && !IsOwn(request, answer)) wire.Send(Bytes{kRefusal});
      });
    }
    KRAL_ConfigureTimeOut(handle(), KRAL_TIME_OUT_COMMAND, kTimeOutMs);
    lying_.state<efs::Settings>().packet_time_out_ms = kTimeOutMs;
  }

  KRAL_HANDLE handle() const { return lying_.handle(); }
  bool HasOpenHandles() const { return !open_.empty(); }

 private:
  static Bytes Recognised(ByteView request, uint8_t command) {
    const auto field = [&](size_t offset) { return request.subspan(std::min(offset, request.size() - 4), 4); };
    if (command == 4) return handset::ByteWriter().Raw(field(4)).Raw(field(12)).Take();
    if (command == 5 || command == 12) return handset::ByteWriter().Raw(field(4)).Raw(field(8)).Take();
    return {};
  }

  static bool IsOwn(ByteView request, ByteView answer) {
    const Bytes recognised = Recognised(request, request[2]);
    return answer.size() >= 4 + recognised.size() && std::equal(request.begin(), request.begin() + 4, answer.begin()) &&
           std::equal(recognised.begin(), recognised.end(), answer.begin() + 4);
  }

  Bytes Answer(ByteView request) {
    const auto said = answers_.Next();
    if (!said) return {kRefusal};
    handset::ByteWriter answer;
    if ((said->control & 1) != 0) {
      answer.Raw(request.first(4));
    } else {
      answer.U8(75);  // anything else would be waited behind, or fail at once
    }
    if ((said->control & 2) != 0) answer.Raw(Recognised(request, request[2]));
    return answer.Raw(said->bytes).Take();
  }

  void Note(ByteView request, const Bytes& answer) {
    const uint8_t command = request[2];
    if (command == 3 || command == 13) open_.erase({command, handset::GetU32(request, 4)});
    const bool is_own = answer.size() >= 12 && std::equal(request.begin(), request.begin() + 4, answer.begin());
    if ((command == 2 || command == 11) && is_own && handset::GetU32(answer, 8) == 0) {
      open_.insert({command == 2 ? 3 : 13, handset::GetU32(answer, 4)});
    }
  }

  fuzz::Parts answers_;
  std::set<std::pair<int, uint32_t>> open_;  // with the command that closes
  fuzz::LyingHandset lying_;
};

void ReadFile(KRAL_HANDLE handle) {
  constexpr uint32_t kRoom = 2000;
  Bytes buffer(kRoom);  // the address sanitizer sees what is written behind it
  uint32_t size = kRoom;
  const bool read = KRAL_EfsReadMem(handle, "/f", buffer.data(), &size) == 1;
  Require(read ? size <= kRoom : size == kRoom);
}

void WriteFile(KRAL_HANDLE handle) {
  const Bytes data(1200, 0x7E);
  KRAL_EfsWriteMem(handle, data.data(), static_cast<uint32_t>(data.size()), "/f");
}

void List(KRAL_HANDLE handle) {
  constexpr uint32_t kRoom = 3;
  std::vector<KRAL_EFS_ENTRY> entries(kRoom);
  std::memset(entries.data(), 0xEE, kRoom * sizeof(KRAL_EFS_ENTRY));
  uint32_t count = kRoom;
  if (KRAL_EfsDirectory(handle, "/d", KRAL_EFS_FILTER_ALL, entries.data(), &count) == 0) return Require(count == kRoom);
  for (uint32_t i = 0; i < std::min(count, kRoom); ++i) {
    Require(std::memchr(entries[i].name, 0, KRAL_EFS_NAME_SIZE) != nullptr);
    Require(std::string_view(entries[i].name).starts_with("/d/"));
  }
}

void AskOnce(KRAL_HANDLE handle) {
  constexpr uint32_t kRoom = 8;
  uint32_t error = 77;
  uint32_t value = 0;
  Bytes text(kRoom, 0xEE);
  auto* const characters = reinterpret_cast<char*>(text.data());
  if (KRAL_EfsReadLink(handle, "/l", &error, characters, kRoom) == 1 && error == 0) {
    Require(std::memchr(characters, 0, kRoom) != nullptr);
  }
  KRAL_EFS2_DIAG_EXTENDED_INFO(handle, 1, &error, &value, &value, characters, kRoom);
  KRAL_EFS_DEVICE_INFO device{};
  error = 77;
  if (KRAL_EFS2_DIAG_DEV_INFO(handle, &error, &device) == 0) Require(error == 77);
  Require(std::memchr(device.name, 0, sizeof(device.name)) != nullptr);
  KRAL_EFS_STATFS status{};
  KRAL_EFS2_DIAG_STATFS(handle, "/", &error, &status);
  uint64_t used = 0;
  KRAL_EFS2_GetGroupInfo(handle, "/", &used);
  KRAL_EFS2_DIAG_STAT(handle, "/f", &error, &value, &value, &value, &value, &value, &value);
  KRAL_EfsMkDir(handle, "/d", &error);
  KRAL_EfsDelete(handle, "/f", &error);
}

void PutItem(KRAL_HANDLE handle) {
  const Bytes data(100);
  KRAL_EfsPutItemFromMem(handle, "/i", data.data(), static_cast<uint32_t>(data.size()));
  KRAL_EFS2_SyncWithWait(handle, "/", 1);
}

constexpr void (*kOperations[])(KRAL_HANDLE) = {ReadFile, WriteFile, List, AskOnce, PutItem};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 1) return 0;
  LyingFiles handset({data + 1, size - 1});
  kOperations[data[0] % std::size(kOperations)](handset.handle());
  Require(!handset.HasOpenHandles());
  return 0;
}
