// golden FILE PORT...: restores a PKV file to the handsets on all ports at once, compares, and gives a verdict on each;
// with the job of kral.hpp.
// Exit codes: 0 all passed, 1 some did not, 2 usage, else the code of what kept the job from beginning
// (KRAL_ERROR_...).
#include <cstdio>
#include <cstdlib>
#include <vector>

#include "kral/kral.hpp"

namespace {

bool Restore(const char *file, const std::vector<std::uint32_t> &ports) {
  kral::Job job;
  job.Call(KRAL_VENTRIMS_AddIdentity);
  job.Call(KRAL_VENTRIMS_AddRestore, file);
  job.Call(KRAL_VENTRIMS_AddVerify, file);
  for (const std::uint32_t port : ports) job.Add(port);

  job.Start();  // files and ports are looked at; nothing was sent if this throws
  while (!job.Wait(1000)) std::fprintf(stderr, "%u to go\n", job.state().waiting + job.state().working);

  for (std::uint32_t handset = 0; handset < ports.size(); ++handset) {
    const KRAL_VENTRIMS_RESULT result = job.result(handset);
    std::printf("%u: %s %s, %s\n", result.progress.port, result.progress.model, result.progress.serial,
                result.passed ? "passed" : result.error.text);
  }
  return job.state().passed == ports.size();
}

}  // namespace

int main(int argc, char **argv) {
  if (argc < 3) {
    std::fprintf(stderr, "usage: golden FILE PORT...\n");
    return 2;
  }
  std::vector<std::uint32_t> ports;
  for (int i = 2; i < argc; ++i) ports.push_back(static_cast<std::uint32_t>(std::strtoul(argv[i], nullptr, 10)));
  try {
    return Restore(argv[1], ports) ? 0 : 1;
  } catch (const kral::Error &failure) {
    std::fprintf(stderr, "%s: %s\n", failure.record().function, failure.what());
    return static_cast<int>(failure.code());
  }
}
