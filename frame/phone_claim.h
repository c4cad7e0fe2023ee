// Which job works on a handset, kept with its phone object.
#ifndef KRAL_FRAME_PHONE_CLAIM_H
#define KRAL_FRAME_PHONE_CLAIM_H

#include <atomic>
#include <cstdint>

namespace kral {

struct PhoneClaim {
  std::atomic<uint32_t> job{0};
};

}  // namespace kral

#endif
