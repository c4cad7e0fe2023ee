// A handset that answers every command with whatever it likes, by way of a phone server: without a line, threads and
// waiting. Outputs stay within their room, and change on success only.
//
// Byte 0 chooses the operation, the answers are the parts behind it: bits 3..7 tell how many bytes of the request stand
// in front of a part, 31 all of them. Nothing at all is silence; requests beyond the last answer are refused.
#include <algorithm>
#include <array>
#include <cstring>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "commands/core/core_diag.h"
#include "frame/orbt_server.h"
#include "frame/resource_manager.h"
#include "fuzz/support.h"
#include "kral/connection.h"
#include "kral/diag.h"
#include "kral/efs.h"
#include "kral/ftm.h"
#include "kral/log.h"
#include "kral/nv.h"
#include "kral/pkv.h"
#include "storage/backup/pkv_jobs.h"
#include "storage/nv/nv_mobile.h"
#include "storage/nv/nv_value.h"

namespace {

using namespace kral;
using fuzz::Bytes;
using fuzz::ByteView;
using fuzz::Require;

class LyingServer final : public OrbtServer {
 public:
  explicit LyingServer(fuzz::Parts& answers) : answers_(answers) {}

  bool ConnectToPort(uint16_t, uint32_t) override { return true; }
  bool SendRequest(ByteView request, uint32_t, Bytes& reply) override {
    constexpr size_t kAll = 31;
    const auto said = answers_.Next();
    if (!said) {
      reply = {19};
      return true;
    }
    const size_t repeated = said->control >> 3 == kAll ? request.size() : said->control >> 3;
    reply.assign(request.begin(), request.begin() + static_cast<std::ptrdiff_t>(std::min(repeated, request.size())));
    reply.insert(reply.end(), said->bytes.begin(), said->bytes.end());
    return !reply.empty();
  }
  void RegisterListener(PacketListener&) override {}
  void UnregisterListener(PacketListener&) override {}
  std::vector<std::string> AllPorts() override { return {}; }
  std::vector<std::string> PortsWithPhone() override { return {}; }

 private:
  fuzz::Parts& answers_;
};

class Connection {
 public:
  explicit Connection(fuzz::Parts& answers) {
    KRAL_SetLibraryMode(KRAL_LIBRARY_MODE_SERVER);
    SetServerFactory({[&answers](const char*) { return std::make_unique<LyingServer>(answers); },
                      [](const char*, OrbtServer&) { return std::make_unique<SoftwareDownload>(); }});
    handle_ = KRAL_ConnectServer(1);
    for (const int delay : {KRAL_TIME_OUT_AFTER_FTM, KRAL_TIME_OUT_AFTER_ONLINE, KRAL_TIME_OUT_AFTER_OFFLINE,
                            KRAL_TIME_OUT_GSM_RF_MODE, KRAL_TIME_OUT_MODE_READ_BACK}) {
      KRAL_ConfigureTimeOut(handle_, static_cast<uint32_t>(delay), 0);
    }
  }
  ~Connection() { KRAL_DisconnectAllServers(); }
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;

  KRAL_HANDLE handle() const { return handle_; }

 private:
  KRAL_HANDLE handle_ = 0;
};

Diag_FTM& PhoneOf(KRAL_HANDLE handle) {
  return *Kral_ResourceManager::GetPhone(handle);
}

// Room of its own, so that the address sanitizer sees what is written behind it.
template <class Element, class Call>
void Fill(size_t count, Call&& call) {
  const std::vector<Element> before(count, static_cast<Element>(0xA5));
  auto room = std::make_unique<Element[]>(count);
  std::ranges::copy(before, room.get());
  if (call(room.get()) == 0) Require(std::equal(before.begin(), before.end(), room.get()));
}

void Identify(KRAL_HANDLE handle) {
  std::array<uint8_t, 6> bytes{};
  uint16_t revision = 0;
  Fill<char>(46, [&](char* texts) {
    return KRAL_DIAG_VERNO_F(handle, texts, texts + 11, texts + 19, texts + 30, texts + 38, &bytes[0], &bytes[1],
                             &bytes[2], &revision, &bytes[3], &bytes[4], &bytes[5]);
  });
  uint32_t hardware = 0;
  Fill<char>(size_t{2} * KRAL_BUILD_ID_TEXT_SIZE, [&](char* texts) {
    char* const model = texts + KRAL_BUILD_ID_TEXT_SIZE;
    const uint8_t done = KRAL_DIAG_EXT_BUILD_ID_F(handle, &hardware, nullptr, texts, model);
    if (done == 1) {
      for (const char* text : {texts, model}) Require(std::memchr(text, 0, KRAL_BUILD_ID_TEXT_SIZE) != nullptr);
    }
    return done;
  });
  Fill<uint32_t>(1, [&](uint32_t* serial) { return KRAL_DIAG_READ_ESN_F(handle, serial); });
  uint32_t state = 0;
  diag::GetPhoneOperatingMode(PhoneOf(handle), state);
  KRAL_IsPhoneConnected(handle);
}

void ReachMemory(KRAL_HANDLE handle) {
  constexpr uint16_t kCount = 5;
  const std::array<uint32_t, kCount> words{};
  const auto* const bytes = reinterpret_cast<const uint8_t*>(words.data());
  const auto* const shorts = reinterpret_cast<const uint16_t*>(words.data());
  Fill<uint8_t>(kCount, [&](uint8_t* data) { return KRAL_DIAG_MEMORY_PEEK_F(handle, 0x1000, kCount, data); });
  Fill<uint16_t>(kCount, [&](uint16_t* data) { return KRAL_DIAG_MEMORY_PEEK_WORD_F(handle, 0x1000, kCount, data); });
  Fill<uint32_t>(kCount, [&](uint32_t* data) { return KRAL_DIAG_MEMORY_PEEK_DWORD_F(handle, 0x1000, kCount, data); });
  Fill<uint8_t>(1, [&](uint8_t* status) { return KRAL_DIAG_MEMORY_POKE_F(handle, 0x1000, kCount, bytes, status); });
  Fill<uint8_t>(1,
                [&](uint8_t* status) { return KRAL_DIAG_MEMORY_POKE_WORD_F(handle, 0x1000, kCount, shorts, status); });
  Fill<uint8_t>(
      1, [&](uint8_t* status) { return KRAL_DIAG_MEMORY_POKE_DWORD_F(handle, 0x1000, kCount, words.data(), status); });
}

void Serve(KRAL_HANDLE handle) {
  Fill<uint16_t>(1, [&](uint16_t* switches) { return KRAL_DIAG_GET_DIPSW_F(handle, switches); });
  Fill<uint8_t>(1, [&](uint8_t* result) { return KRAL_DIAG_SPC_F(handle, "000000", result); });
  KRAL_DIAG_HS_KEY_F(handle, 0, 1);
  KRAL_DIAG_ERR_CLEAR_F(handle, 0);
  for (const auto read : {KRAL_DIAG_ERR_READ_F, KRAL_DIAG_STATUS_F, KRAL_DIAG_IS2000_STATUS_F}) {
    constexpr uint16_t kRoom = 9;
    uint16_t size = kRoom;
    Fill<uint8_t>(kRoom, [&](uint8_t* record) { return read(handle, &size, record); });
    Require(size <= kRoom);
  }
  KRAL_DIAG_CONTROL_F(handle, KRAL_MODE_ONLINE);
}

void MoveItems(KRAL_HANDLE handle) {
  constexpr uint16_t kSize = 12;
  const Bytes data(kSize, 3);
  const uint16_t read_only = 453;
  uint16_t status = 0;
  Fill<uint8_t>(kSize, [&](uint8_t* item) { return KRAL_DIAG_NV_READ_F(handle, 453, item, kSize, &status); });
  Fill<uint8_t>(kSize, [&](uint8_t* item) { return KRAL_DIAG_NV_READ_EXT_F(handle, 453, item, 1, kSize, &status); });
  Fill<uint8_t>(kSize, [&](uint8_t* item) { return KRAL_DIAG_NV_READ_ARRAY_F(handle, 453, 2, item, kSize, &status); });
  KRAL_DIAG_NV_WRITE_F(handle, 453, data.data(), kSize, &status);
  KRAL_DIAG_NV_WRITE_EXT_F(handle, 453, data.data(), 1, kSize, &status);
  KRAL_DIAG_NV_WRITE_ARRAY_F(handle, 453, 2, data.data(), kSize, &status);
  KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(handle, &read_only, 1);
  KRAL_DIAG_NV_WRITE_SetBatchMode(handle, 1);
  for (uint16_t item = 453; item < 456; ++item) KRAL_DIAG_NV_WRITE_F(handle, item, data.data(), kSize, &status);
  uint8_t last = 0;
  KRAL_DIAG_NV_WRITE_FlushBatchQueue(handle, &status, &status, &last);
}

void ChooseTraffic(KRAL_HANDLE handle) {
  constexpr uint16_t kRoom = 4;
  constexpr uint16_t kCodes[] = {0x1000, 0x1007};
  Fill<uint32_t>(KRAL_EQUIPMENT_IDS, [&](uint32_t* items) { return KRAL_DIAG_GetLogRanges(handle, items); });
  uint32_t bits = 0;
  uint16_t events = 0;
  uint16_t size = kRoom;
  Fill<uint8_t>(kRoom, [&](uint8_t* mask) { return KRAL_DIAG_GetLogMask(handle, 1, &bits, &size, mask); });
  Require(size <= kRoom);
  KRAL_DIAG_AddExtendedLogCodes(handle, 1, kCodes, 2);
  KRAL_DIAG_ClearAllLogCodes(handle, 1);
  size = kRoom;
  Fill<uint8_t>(kRoom, [&](uint8_t* mask) { return KRAL_DIAG_GetEventMask(handle, &events, &size, mask); });
  Require(size <= kRoom);
  KRAL_DIAG_SetEventMaskBits(handle, kCodes, 2, 1);
  KRAL_DIAG_SetEntireEventMaskState(handle, 1);
}

void TestRadio(KRAL_HANDLE handle) {
  for (const uint16_t code : std::array<uint16_t, 2>{KRAL_FTM_COMMAND_CODE_SUBSYSTEM, KRAL_FTM_COMMAND_CODE_LEGACY}) {
    constexpr uint16_t kRoom = 6;
    const std::array<uint8_t, 3> payload{};
    KRAL_FTM_SET_COMMAND_CODE(handle, code);
    uint16_t size = kRoom;
    Fill<uint8_t>(kRoom, [&](uint8_t* response) {
      return KRAL_FTM_SendCommandTo(handle, 9, KRAL_FTM_HEADER_PLAIN, 7, payload.data(), 3, response, &size);
    });
    Require(size <= kRoom);
    KRAL_FTM_SET_CHAN(handle, 600);
  }
  KRAL_FTM_SET_COMMAND_CODE(handle, KRAL_FTM_COMMAND_CODE_SUBSYSTEM);
  KRAL_FTM_SET_MODE(handle, 9);
  uint8_t is_ftm = 0;
  KRAL_IsFTM_Mode(handle, &is_ftm);
  KRAL_ChangeFTM_ModeRuntime(handle, 1);
}

// Of each kind that there is: a plain one, an array, a file, and one that the RF dispatcher knows.
std::vector<nv::NvItem> EveryKind() {
  return {nv::GenericItem(453), nv::GenericItem(7, 1), nv::GenericFile("/nv/item_files/a", 4),
          nv::GenericFile("/nv/item_files/rfnv/00020001", 4)};
}

void ReadDefined(KRAL_HANDLE handle) {
  nv::NvMobile mobile(PhoneOf(handle), 0);
  for (nv::NvItem& item : EveryKind()) {
    nv::NvBytes stored;
    if (!mobile.Read(item, item.max_index, stored).done()) continue;
    if (const auto value = nv::FromStored(item, stored)) Require(!item.type->ToText(*value).empty() || value->empty());
    mobile.Write(item, item.max_index, stored);
  }
  std::vector<items::PhoneItems::FoundFile> files;
  mobile.ListItemFiles(files);
  for (const auto& file : files) Require(!file.path.empty());
}

void Restore(KRAL_HANDLE handle) {
  pkv::PkvSet set;
  for (uint16_t id = 0; id < 4; ++id) set.items.push_back({.id = id, .index = 0, .subscription = 0});
  set.items.push_back({.id = 7, .index = 1, .subscription = 0});
  set.items.push_back({.id = 9, .index = 0, .subscription = 1});
  set.files.push_back({"/nv/item_files/a", 0xE1FF, Bytes(4, 1)});
  set.files.push_back({"/plain", 0x81FF, Bytes(4, 1)});
  for (const auto job : {static_cast<uint32_t (*)(Diag_FTM&, const pkv::PkvSet&)>(backup::Restore),
                         static_cast<uint32_t (*)(Diag_FTM&, const pkv::PkvSet&)>(backup::Verify)}) {
    const uint32_t status = job(PhoneOf(handle), set);
    KRAL_PKV_COUNTS counts{};
    KRAL_PKV_GetCounts(handle, &counts);
    Require(counts.total == counts.done + counts.skipped + counts.refused + counts.different + counts.not_read_back +
                                counts.not_reached);
    if (status == KRAL_PKV_STATUS_DONE) Require(counts.done + counts.skipped == counts.total);
  }
}

// What efs_fuzzer.cpp asks over a line, where answers of others are waited behind: here every answer is the request's.
void MoveFiles(KRAL_HANDLE handle) {
  constexpr uint32_t kRoom = 700;
  Bytes data(kRoom);
  uint32_t size = kRoom;
  const bool read = KRAL_EfsReadMem(handle, "/f", data.data(), &size) == 1;
  Require(read ? size <= kRoom : size == kRoom);
  KRAL_EfsWriteMem(handle, data.data(), kRoom, "/f");
  KRAL_EfsPutItemFromMem(handle, "/i", data.data(), 100);
  constexpr uint32_t kEntries = 3;
  std::vector<KRAL_EFS_ENTRY> entries(kEntries);
  uint32_t count = kEntries;
  if (KRAL_EfsDirectory(handle, "/d", KRAL_EFS_FILTER_ALL, entries.data(), &count) == 0)
    return Require(count == kEntries);
  entries.resize(std::min(count, kEntries));
  for (const KRAL_EFS_ENTRY& entry : entries) Require(std::memchr(entry.name, 0, KRAL_EFS_NAME_SIZE) != nullptr);
}

constexpr void (*kOperations[])(KRAL_HANDLE) = {Identify,  ReachMemory, Serve,   MoveItems, ChooseTraffic,
                                                TestRadio, ReadDefined, Restore, MoveFiles};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 1) return 0;
  fuzz::Parts answers({data + 1, size - 1});
  const Connection connection(answers);
  kOperations[data[0] % std::size(kOperations)](connection.handle());
  return 0;
}
