// Why downloads fail, as callers learn it: every kind of failure with its code, the handset's status, line and offset,
// and a sentence that names what was wrong.
#include <gtest/gtest.h>

#include <filesystem>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "kral/error.h"
#include "kral/kral.h"
#include "tests/support/boot_wire.h"
#include "tests/support/download_fixture.h"
#include "tests/support/hex_files.h"
#include "tests/support/scripted_server.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

using handset::When;
using test::Bytes;

struct Expected {
  uint32_t code;
  const char* text;  // a part of the sentence
  uint32_t status_kind = KRAL_ERROR_STATUS_NONE;
  uint32_t status = 0;
  std::optional<uint32_t> line = {};
  std::optional<uint64_t> offset = {};
};

struct Row {
  const char* function;
  std::function<uint8_t()> call;
  Expected expected;
};

void ExpectFailures(KRAL_HANDLE handle, const std::vector<Row>& rows) {
  for (const auto& [function, call, expected] : rows) {
    SCOPED_TRACE(testing::Message() << function << ": " << expected.text);
    EXPECT_EQ(call(), 0);
    KRAL_ERROR error{};
    ASSERT_EQ(KRAL_GetLastError(handle, &error), 1);
    EXPECT_STREQ(error.function, function);
    EXPECT_EQ(error.code, expected.code);
    EXPECT_NE(std::string(error.text).find(expected.text), std::string::npos) << error.text;
    EXPECT_EQ(error.status_kind, expected.status_kind);
    EXPECT_EQ(error.status, expected.status);
    EXPECT_EQ((error.present & KRAL_ERROR_HAS_LINE) != 0, expected.line.has_value());
    EXPECT_EQ(error.line, expected.line.value_or(0));
    EXPECT_EQ((error.present & KRAL_ERROR_HAS_OFFSET) != 0, expected.offset.has_value());
    EXPECT_EQ(error.offset, expected.offset.value_or(0));
  }
}

TEST(ImageFailures, NameFileAndLine) {
  const test::TempFolder folder;
  const auto broken = folder.Add("broken.hex", test::kBrokenHex);
  const auto dropped = folder.Add("dropped.hex", test::kDroppedHex);
  const auto endless = folder.Add("endless.hex", ":020000040002F8\n:0100000055AA\n");
  const auto far = folder.Add(
      "far.hex", ":020000040002F8\n:0100000055AA\n" + test::HexRecord("02000004F000") + test::HexRecord("0100000055"));
  const auto glued = folder.Add("glued.hex", ":020000040002F8\n:0100000055AA:0100010055A9\n:00000001FF\n");
  const auto two = folder.Add("two.hex", test::kTwoRegionsHex);
  const auto binary = folder.Add("image.bin", std::string(0x10001, 'x'));
  const auto empty = folder.Add("empty.bin", "");
  const auto large = folder.Add("large.bin", "");
  std::filesystem::resize_file(large, uint64_t{5} << 30);
  const auto missing = folder.Path("missing.bin");
  const auto info = [](const std::string& file, uint32_t format = KRAL_IMAGE_FORMAT_BY_CONTENT) {
    return [file, format] {
      KRAL_IMAGE_INFO told{};
      return KRAL_IMAGE_GetInfo(file.c_str(), format, &told, nullptr);
    };
  };
  const auto convert = [](const std::string& input, const std::string& output, uint32_t direction, uint32_t base = 0) {
    return [=]() mutable { return KRAL_HEX_Convert(input.c_str(), output.c_str(), direction, &base, nullptr); };
  };
  const auto output = folder.Path("output");
  uint32_t line = 0;
  ExpectFailures(
      0, {
             {"KRAL_IMAGE_GetInfo",
              [] { return KRAL_IMAGE_GetInfo(nullptr, 0, nullptr, nullptr); },
              {KRAL_ERROR_ARGUMENT, "file"}},
             {"KRAL_IMAGE_GetInfo", info(missing), {KRAL_ERROR_BAD_FILE, "missing.bin cannot be opened"}},
             {"KRAL_IMAGE_GetInfo", info(missing, KRAL_IMAGE_FORMAT_HEX), {KRAL_ERROR_BAD_FILE, "cannot be opened"}},
             {"KRAL_IMAGE_GetInfo", info(empty), {KRAL_ERROR_BAD_FILE, "empty.bin is empty"}},
             {"KRAL_IMAGE_GetInfo", info(large), {KRAL_ERROR_BAD_FILE, "large.bin has 4 GiB or more"}},
             {"KRAL_IMAGE_GetInfo", info(binary, 9), {KRAL_ERROR_ARGUMENT, "no image format 9"}},
             {"KRAL_IMAGE_GetInfo", info(broken), {KRAL_ERROR_BAD_FILE, "holds no sound Intel HEX record", 0, 0, 2}},
             {"KRAL_IMAGE_GetInfo", info(endless), {KRAL_ERROR_BAD_FILE, "no end-of-file record", 0, 0, 2}},
             {"KRAL_IMAGE_GetInfo", info(far), {KRAL_ERROR_BAD_FILE, "lie outside of the image", 0, 0, 4}},
             {"KRAL_IMAGE_GetInfo", info(empty, KRAL_IMAGE_FORMAT_HEX), {KRAL_ERROR_BAD_FILE, "no Intel HEX record"}},
             {"KRAL_IMAGE_GetInfo", info(glued), {KRAL_ERROR_BAD_FILE, "have no place in the image", 0, 0, 2}},
             {"KRAL_IMAGE_GetInfo", info(dropped), {KRAL_ERROR_BAD_FILE, "have no place in the image", 0, 0, 1}},
             {"KRAL_HEX_FindLoss",
              [&] { return KRAL_HEX_FindLoss(broken.c_str(), &line, nullptr, nullptr); },
              {KRAL_ERROR_BAD_FILE, "broken.hex", 0, 0, 2}},
             {"KRAL_HEX_FindLoss",
              [] { return KRAL_HEX_FindLoss(nullptr, nullptr, nullptr, nullptr); },
              {KRAL_ERROR_ARGUMENT, "file"}},
             {"KRAL_HEX_Convert", convert(two, output, KRAL_HEX_TO_BINARY), {KRAL_ERROR_BAD_FILE, "second region"}},
             {"KRAL_HEX_Convert",
              convert(binary, output, KRAL_HEX_FROM_BINARY, 0x100),
              {KRAL_ERROR_ARGUMENT, "0x00000100"}},
             {"KRAL_HEX_Convert",
              convert(binary, output, KRAL_HEX_FROM_BINARY, 0xFFFF0000),
              {KRAL_ERROR_ARGUMENT, "past address 0xFFFFFFFF"}},
             {"KRAL_HEX_Convert", convert(binary, output, 2), {KRAL_ERROR_ARGUMENT, "direction"}},
             {"KRAL_HEX_Convert",
              convert(binary, folder.Path("no/folder"), KRAL_HEX_FROM_BINARY),
              {KRAL_ERROR_BAD_FILE, "cannot be written"}},
         });
  KRAL_ERROR error{};
  EXPECT_EQ(KRAL_GetLastError(0, &error), 1);
  EXPECT_NE(error.system_error, 0u);
}

class DownloadFailures : public test::DownloadTest {
 protected:
  static constexpr uint8_t kOther = 13;  // the code of no reply here

  // The fault strikes the first reply from now on, or the first with that code.
  std::function<uint8_t()> Struck(handset::Fault fault, const When& when, std::function<uint8_t()> call) {
    return [=, this] {
      handset().faults().Clear();
      handset().faults().Add(fault, when);
      const uint8_t result = call();
      handset().faults().Clear();
      return result;
    };
  }
  // Replies are lost, and silence is not awaited for long. Everything else may take its time on a busy machine.
  std::function<uint8_t()> Silent(const When& when, std::function<uint8_t()> call) {
    return [=, this] {
      settings().handshake_limit_ms = 50;
      AcknowledgeWithin(30);
      KRAL_ConfigureTimeOut(handle(), 0, 250);
      const uint8_t result = Struck(handset::Lose(), when, call)();
      settings().handshake_limit_ms = UINT32_MAX;
      AcknowledgeWithin(UINT32_MAX);
      KRAL_ConfigureTimeOut(handle(), 0, 2000);
      return result;
    };
  }
  std::function<uint8_t()> Write(const std::string& file, uint32_t format = KRAL_IMAGE_FORMAT_BY_CONTENT,
                                 uint8_t method = KRAL_STREAM_MULTI_IMAGE, uint32_t block_size = 1000,
                                 const char* header = nullptr) {
    return [=, this] {
      return KRAL_STREAM_WriteImageFile(handle(), file.c_str(), format, 5, header, method, block_size, 4, nullptr);
    };
  }
  std::function<uint8_t()> WriteBytes(const uint8_t* data, uint32_t size, uint32_t address) {
    return [=, this] {
      return KRAL_STREAM_WriteImageMem(handle(), data, size, address, 5, nullptr, 0, 0, 1000, 4, nullptr);
    };
  }
  std::function<uint8_t()> Load(const std::string& file, uint32_t packet = 32) {
    return [=, this] { return KRAL_KOVA_LoadFlashProgrammer(handle(), file.c_str(), packet, nullptr); };
  }
  std::function<uint8_t()> Aborted(std::function<uint8_t()> call) {
    return [=, this] {
      const auto abort = [](KRAL_HANDLE phone, uint32_t, uint32_t, uintptr_t) { KRAL_AbortDownload(phone); };
      KRAL_ConfigureDownloadCallBack(handle(), abort, 0);
      const uint8_t result = call();
      KRAL_ConfigureDownloadCallBack(handle(), nullptr, 0);
      return result;
    };
  }

  test::TempFolder folder_;
};

TEST_F(DownloadFailures, OfTheLoaderAreTold) {
  const std::string base = ":020000040002F8\n:02000000AABB99\n";
  const auto good = folder_.Add("good.hex", base + ":0400000500020000F5\n:00000001FF\n");
  const auto startless = folder_.Add("startless.hex", base + ":00000001FF\n");
  const auto version = [this] {
    uint8_t told = 0;
    return KRAL_KOVA_SW_VERSION(handle(), &told);
  };
  handset().Expect("0C").Reply("0D");
  ExpectFailures(handle(), {{"KRAL_KOVA_SW_VERSION", version, {KRAL_ERROR_LINK, "no version"}}});
  StartLoader();
  constexpr auto kLoad = "KRAL_KOVA_LoadFlashProgrammer";
  ExpectFailures(
      handle(),
      {
          {kLoad,
           [this] { return KRAL_KOVA_LoadFlashProgrammer(handle(), nullptr, 32, nullptr); },
           {KRAL_ERROR_ARGUMENT, "no file name"}},
          {kLoad, Load(folder_.Path("missing")), {KRAL_ERROR_BAD_FILE, "missing cannot be opened"}},
          {kLoad, Load(folder_.Add("broken.hex", test::kBrokenHex)), {KRAL_ERROR_BAD_FILE, "line 2", 0, 0, 2}},
          {kLoad, Load(folder_.Add("dropped.hex", test::kDroppedHex)), {KRAL_ERROR_BAD_FILE, "line 1", 0, 0, 1}},
          {kLoad, Load(startless), {KRAL_ERROR_BAD_FILE, "0xFFFFFFFF"}},
          {kLoad, Load(good, 1), {KRAL_ERROR_ARGUMENT, "packets"}},
          {kLoad, Aborted(Load(good)), {KRAL_ERROR_ABORTED, "aborted"}},
          {kLoad,
           Struck(handset::WrongCode(kOther), When::Nth(1), Load(good)),
           {KRAL_ERROR_LINK, "command 15", KRAL_ERROR_STATUS_REPLY, kOther}},
          {kLoad,
           Struck(handset::WrongCode(kOther), When::Nth(2), Load(good)),
           {KRAL_ERROR_LINK, "command 5", KRAL_ERROR_STATUS_REPLY, kOther}},
          {kLoad, Silent(When::Nth(1), Load(good)), {KRAL_ERROR_NO_ANSWER, "command 15"}},
          {"KRAL_KOVA_NOP",
           Silent(When::Nth(1), [this] { return KRAL_KOVA_NOP(handle()); }),
           {KRAL_ERROR_NO_ANSWER, "command 6"}},
          {"KRAL_KOVA_SW_VERSION", Silent(When::Nth(1), version), {KRAL_ERROR_NO_ANSWER, "command 12"}},
      });
}

TEST_F(DownloadFailures, OfTheFlashProgrammerAreTold) {
  StartProgrammer();
  const auto image = folder_.Add("image.bin", std::string(3000, 'x'));
  const auto missing = folder_.Path("missing");
  const auto long_header = folder_.Add("header", std::string(513, 'h'));
  const std::vector<uint8_t> bytes(300);
  const auto table = [this](const std::string& file) {
    return [=, this] { return KRAL_STREAM_PARTITION_TABLE(handle(), file.c_str(), 0, nullptr); };
  };
  const auto hello = [this](uint32_t variant) {
    return [=, this] { return KRAL_STREAM_HELLO(handle(), variant, nullptr, nullptr); };
  };
  EXPECT_EQ(table(folder_.Add("table1", "\x01NAME1"))(), 1);
  constexpr auto kFile = "KRAL_STREAM_WriteImageFile";
  constexpr auto kMem = "KRAL_STREAM_WriteImageMem";
  constexpr auto kTable = "KRAL_STREAM_PARTITION_TABLE";
  constexpr auto kHello = "KRAL_STREAM_HELLO";
  ExpectFailures(
      handle(),
      {
          {kFile,
           [this] { return KRAL_STREAM_WriteImageFile(handle(), nullptr, 0, 0, nullptr, 0, 1, 1, nullptr); },
           {KRAL_ERROR_ARGUMENT, "no file name"}},
          {kFile, Write(missing), {KRAL_ERROR_BAD_FILE, "missing cannot be opened"}},
          {kFile, Write(image, 9), {KRAL_ERROR_ARGUMENT, "format 9"}},
          {kFile, Write(image, 0, 9), {KRAL_ERROR_ARGUMENT, "method 9"}},
          {kFile, Write(image, 0, 0, 0), {KRAL_ERROR_ARGUMENT, "blocks of 0 bytes"}},
          {kFile, Write(image, 0, 0, 1000, missing.c_str()), {KRAL_ERROR_BAD_FILE, "missing"}},
          {kFile, Write(image, 0, 0, 1000, long_header.c_str()), {KRAL_ERROR_ARGUMENT, "513 bytes"}},
          {kFile, Write(folder_.Add("dropped.hex", test::kDroppedHex)), {KRAL_ERROR_BAD_FILE, "line 1", 0, 0, 1}},
          {kFile, Write(folder_.Add("two.hex", test::kTwoRegionsHex)), {KRAL_ERROR_BAD_FILE, "second region"}},
          {kFile, Silent(When::Nth(1), Write(image)), {KRAL_ERROR_NO_ANSWER, "command 27"}},
          {kFile,
           Struck(handset::WrongCode(kOther), When::Nth(1), Write(image)),
           {KRAL_ERROR_LINK, "command 27", KRAL_ERROR_STATUS_REPLY, kOther}},
          {kFile,
           Struck(handset::WrongCode(kOther), When::Nth(1).Of("08"), Write(image)),
           {KRAL_ERROR_LINK, "instead of an acknowledgement", KRAL_ERROR_STATUS_REPLY, kOther, {}, 0}},
          {kFile,
           Silent(When::From(2).Of("08"), Write(image)),
           {KRAL_ERROR_LOST, "1000 of 3000 bytes", 0, 0, {}, 1000}},
          {kFile, Silent(When::Nth(1).Of("16"), Write(image)), {KRAL_ERROR_NO_ANSWER, "command 21"}},
          {kFile, Aborted(Write(image)), {KRAL_ERROR_ABORTED, "aborted"}},
          {kMem, WriteBytes(nullptr, 5, 0), {KRAL_ERROR_ARGUMENT, "no bytes"}},
          {kMem, WriteBytes(bytes.data(), 300, 0xFFFFFF00), {KRAL_ERROR_ARGUMENT, "past address 0xFFFFFFFF"}},
          {"KRAL_STREAM_SECURITY_MODE",
           Silent(When::Nth(1), [this] { return KRAL_STREAM_SECURITY_MODE(handle(), 1); }),
           {KRAL_ERROR_NO_ANSWER, "command 23"}},
          {kTable,
           [this] { return KRAL_STREAM_PARTITION_TABLE(handle(), nullptr, 0, nullptr); },
           {KRAL_ERROR_ARGUMENT, "no file name"}},
          {kTable, table(missing), {KRAL_ERROR_BAD_FILE, "missing cannot be opened"}},
          {kTable, table(long_header), {KRAL_ERROR_BAD_FILE, "more than the 512 bytes"}},
          {kTable,
           table(folder_.Add("table2", "\x01NAME2")),
           {KRAL_ERROR_REFUSED, "differs", KRAL_ERROR_STATUS_LOADER, KRAL_STREAM_PARTITION_USE_OVERRIDE}},
          {kHello, hello(2), {KRAL_ERROR_ARGUMENT, "variant 2"}},
          {kHello, Silent(When::Always(), hello(1)), {KRAL_ERROR_NO_ANSWER, "command 1"}},
      });
  handset().programmer().Set({.open_status = 3});
  ExpectFailures(handle(), {{kFile, Write(image), {KRAL_ERROR_REFUSED, "type 5", KRAL_ERROR_STATUS_LOADER, 3}}});
}

class BootFailures : public test::BootWireTest {
 protected:
  static Bytes Packet(std::vector<uint32_t> fields) {
    handset::ByteWriter packet;
    for (const uint32_t field : fields) packet.U32(field);
    return packet.Take();
  }
  static Bytes Hello() { return Packet({1, 48, 2, 1, 1024, 0, 0, 0, 0, 0, 0, 0}); }

  std::function<uint8_t()> Said(std::vector<Bytes> says, std::function<uint8_t()> call) {
    return [=, this] {
      Say(says);
      return call();
    };
  }
  std::function<uint8_t()> Connect(std::vector<Bytes> says, bool ask_identity = false) {
    return Said(std::move(says), [=, this] {
      uint32_t identity = 0;
      return KRAL_Kivrat_Connect(handle_, nullptr, ask_identity ? &identity : nullptr);
    });
  }
  std::function<uint8_t()> Serve(std::vector<Bytes> says) {
    return Said(std::move(says), [this] { return KRAL_Kivrat_DownloadFlashProgrammer(handle_, file_.c_str()); });
  }
  std::function<uint8_t()> FlashAll(const std::string& programmer, std::vector<std::string> images) {
    return [=, this] {
      std::vector<const char*> names;
      for (const auto& image : images) names.push_back(image.c_str());
      return KRAL_Kivrat_FlashAll(handle_, programmer.c_str(), names.data(), nullptr,
                                  static_cast<uint32_t>(names.size()), nullptr, nullptr);
    };
  }

  test::TempFolder folder_;
  const std::string file_ = folder_.Add("programmer", "abcdef");
};

TEST_F(BootFailures, AreTold) {
  constexpr auto kConnect = "KRAL_Kivrat_Connect";
  constexpr auto kServe = "KRAL_Kivrat_DownloadFlashProgrammer";
  constexpr auto kAll = "KRAL_Kivrat_FlashAll";
  const auto loader = KRAL_ERROR_STATUS_LOADER;
  const Bytes end = Packet({4, 16, 13, 0});
  const auto request = [](uint32_t length) { return Packet({3, 20, 13, 0, length}); };
  const auto refuse_writes = [this](const std::function<uint8_t()>& call) {
    return [=, this] {
      wire_.FailWrites(true);
      const uint8_t result = call();
      wire_.FailWrites(false);
      return result;
    };
  };
  ExpectFailures(
      handle_,
      {
          {kServe,
           [this] { return KRAL_Kivrat_DownloadFlashProgrammer(handle_, file_.c_str()); },
           {KRAL_ERROR_ARGUMENT, "no boot loader"}},
          {kConnect, Connect({Bytes()}), {KRAL_ERROR_NO_ANSWER, "hello of the boot loader did not come"}},
          {kConnect, Connect({Bytes(40, 1)}), {KRAL_ERROR_LINK, "40 of 48 bytes"}},
          {kConnect, Connect({Bytes(48, 0)}), {KRAL_ERROR_LINK, "instead of a hello", loader, 0}},
          {kConnect, refuse_writes(Connect({Hello()})), {KRAL_ERROR_LINK, "answer to the hello could not be written"}},
          {kConnect,
           Connect({Hello(), Packet({4, 8})}, true),
           {KRAL_ERROR_LINK, "packet 4 of 8 bytes instead of its readiness", loader, 4}},
          {kConnect,
           Connect({Hello(), Packet({11, 8}), Packet({14, 16, 2, 24})}, true),
           {KRAL_ERROR_NO_ANSWER, "chip identity"}},
          {kServe,
           Said({Bytes()},
                [this] { return KRAL_Kivrat_DownloadFlashProgrammer(handle_, folder_.Path("none").c_str()); }),
           {KRAL_ERROR_BAD_FILE, "none cannot be opened"}},
          {kServe, Serve({Bytes()}), {KRAL_ERROR_NO_ANSWER, "next request"}},
          {kServe, Serve({Packet({3, 7})}), {KRAL_ERROR_LINK, "7 bytes"}},
          {kServe, Serve({Packet({9, 8})}), {KRAL_ERROR_LINK, "packet 9", loader, 9}},
          {kServe, Serve({request(131073)}), {KRAL_ERROR_LINK, "131073 bytes"}},
          {kServe, Serve({request(6), request(1)}), {KRAL_ERROR_BAD_FILE, "after 6 bytes", 0, 0, {}, 6}},
          {kServe, refuse_writes(Serve({request(6)})), {KRAL_ERROR_LINK, "could not be written", 0, 0, {}, 0}},
          {kServe, Serve({end}), {KRAL_ERROR_NO_ANSWER, "answer to the end"}},
          {kServe, Serve({end, Packet({5, 12, 0})}), {KRAL_ERROR_LINK, "packet 5", loader, 5}},
          {kAll, FlashAll(file_, {}), {KRAL_ERROR_ARGUMENT, "no images"}},
          {kAll, FlashAll(folder_.Path("none"), {file_}), {KRAL_ERROR_BAD_FILE, "none cannot be opened"}},
          {kAll, FlashAll(file_, {folder_.Path("lost")}), {KRAL_ERROR_BAD_FILE, "lost cannot be opened"}},
          {kAll, Said({Bytes()}, FlashAll(file_, {file_})), {KRAL_ERROR_NO_ANSWER, "hello"}},
          {"KRAL_SetKivratHelloBehavior",
           [this] { return KRAL_SetKivratHelloBehavior(handle_, 1); },
           {KRAL_ERROR_ARGUMENT, "direct mode"}},
      });
  KRAL_ConfigureDownloadCallBack(
      handle_, [](KRAL_HANDLE handle, uint32_t, uint32_t, uintptr_t) { KRAL_AbortDownload(handle); }, 0);
  ExpectFailures(handle_, {{kServe, Serve({request(6)}), {KRAL_ERROR_ABORTED, "aborted"}}});
}

TEST(ServerFailures, SayThatAPhoneServerDownloadsByItself) {
  test::ScriptedServer server;
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  ExpectFailures(handle,
                 {{"KRAL_KOVA_NOP", [=] { return KRAL_KOVA_NOP(handle); }, {KRAL_ERROR_ARGUMENT, "phone server"}},
                  {"KRAL_Kivrat_Connect",
                   [=] { return KRAL_Kivrat_Connect(handle, nullptr, nullptr); },
                   {KRAL_ERROR_ARGUMENT, "direct mode"}}});
}

}  // namespace
}  // namespace kral
