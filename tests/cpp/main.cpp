// cpp PORT: kral.hpp against a simulated handset that starts in its boot loader.
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "kral/kral.hpp"

namespace {

void Require(bool holds, const char* sentence) {
  if (holds) return;
  std::fprintf(stderr, "not so: %s\n", sentence);
  std::exit(1);
}

// What the call throws; the empty text where it does not.
template <class Call>
std::string Thrown(Call call, std::uint32_t code) {
  try {
    call();
  } catch (const kral::Error& error) {
    return error.code() == code ? error.what() : std::string("code ") + std::to_string(error.code());
  }
  return {};
}

void Write(const char* name, std::string head, std::size_t size) {
  head.resize(size);
  std::ofstream(name, std::ios::binary) << head;
}

// A function that knows whether it lives.
struct Told {
  std::shared_ptr<int> token;
  int* count;
  void operator()(std::uint32_t, std::uint32_t) const { ++*count; }
};

void FlashIsToldToThoseWhoListen(std::uint32_t port) {
  using namespace std::string_literals;
  Write("cpp-programmer.bin", "VHFP\x30\x75\0\0"s, 30000);
  Write("cpp-software.bin", "VHSWVHS-2.0.1\0"s, 20000);
  const char* images[] = {"cpp-software.bin"};
  const std::uint8_t types[] = {2};
  std::uint32_t result = 0, failed = 0, last = 0, whole = 0;
  int ended = 0, replaced = 0;

  kral::Connection phone = kral::Connection::ToBootLoader(port);
  std::weak_ptr<int> of_ended, of_replaced;
  {
    kral::Connection other = kral::Connection::ToBootLoader(port);
    Require(other.handle() == phone.handle(), "connections to one port share their handle");
    Told told{std::make_shared<int>(0), &ended};
    of_ended = told.token;
    other.OnDownload(std::move(told));
    kral::Connection moved = std::move(other);
  }
  Require(of_ended.expired(), "the end of a connection lets go of its function");

  Told first{std::make_shared<int>(0), &replaced};
  of_replaced = first.token;
  kral::Connection careless = kral::Connection::ToBootLoader(port);
  careless.OnDownload([](std::uint32_t, std::uint32_t) { throw 1; });
  phone.OnDownload([&phone, &last, &whole, &of_replaced, first = std::move(first)](std::uint32_t d, std::uint32_t t) {
    first(d, t);
    phone.OnDownload([&last, &whole](std::uint32_t done, std::uint32_t total) { last = done, whole = total; });
    Require(!of_replaced.expired(), "a function that is being told lives until it returns");
  });
  phone.Call(KRAL_Kivrat_FlashAll, "cpp-programmer.bin", images, types, 1, &result, &failed);
  Require(ended == 0 && replaced == 1 && last == whole && whole > 20000, "progress goes to who listens at the time");
  Require(of_replaced.expired(), "a function that was replaced is let go of");
  phone.Call(KRAL_KOVA_RESET);
}

std::uint32_t KRAL_CALL GiveThree(KRAL_HANDLE) {
  return 3;
}

void FailuresAreTheCallsOwn(const kral::Connection& phone) {
  const std::string none = "the call failed, and left no reason";
  Require(Thrown([&] { phone.Call(KRAL_SetPacketMode, 99); }, KRAL_ERROR_ARGUMENT).find("99") != std::string::npos,
          "a failure says why");
  Require(Thrown([&] { phone.Call(KRAL_IsLoggingStarted); }, KRAL_ERROR_INTERNAL) == none,
          "a call that leaves no reason does not tell an earlier one's");
  Require(Thrown([&] { kral::Call(KRAL_IMAGE_GetInfo, "none", 0, nullptr, nullptr); }, KRAL_ERROR_INTERNAL) != none,
          "functions without a handle say why, too");
  Require(Thrown([&] { phone.CallTool(GiveThree); }, KRAL_ERROR_INTERNAL) != none,
          "a code of the NV tool without a reason is told in words");
  std::thread([&] {
    const kral::Attempt attempt(phone.handle());
    std::thread([&] { phone.Ask(KRAL_SetPacketMode, 99); }).join();
    Require(!attempt.HasFailed(), "what another thread's call failed of is not this thread's");
  }).join();
}

void JobsEndWithVerdicts(const kral::Connection& phone) {
  kral::Job job;
  job.Call(KRAL_VENTRIMS_AddMode, KRAL_MODE_OFFLINE_DIGITAL);
  Require(job.Add(phone) == 0, "handsets are counted from 0");
  Require(!Thrown([&] { job.Wait(0); }, KRAL_ERROR_ARGUMENT).empty(), "a job that was not started cannot be awaited");
  kral::Job running = std::move(job);
  running.Start();
  while (!running.Wait(100)) {
  }
  Require(running.result(0).passed == 1 && running.state().passed == 1, "the handset passed");

  Require(kral::Job(KRAL_VENTRIMS_RESET).options().flags == KRAL_VENTRIMS_RESET, "a job has its flags");
  kral::Job wrong;
  wrong.Call(KRAL_VENTRIMS_AddVerify, "none.pkv");
  wrong.Add(phone);
  Require(Thrown([&] { wrong.Start(); }, KRAL_ERROR_BAD_FILE).find("none.pkv") != std::string::npos,
          "a start says what is wrong");
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 2) return 2;
  const auto port = static_cast<std::uint32_t>(std::strtoul(argv[1], nullptr, 10));
  try {
    FlashIsToldToThoseWhoListen(port);
    const kral::Connection phone(port);
    FailuresAreTheCallsOwn(phone);
    JobsEndWithVerdicts(phone);
  } catch (const kral::Error& error) {
    std::fprintf(stderr, "%s: %s\n", error.record().function, error.what());
    return 1;
  }
  std::puts("kral.hpp does what it says");
  return 0;
}
