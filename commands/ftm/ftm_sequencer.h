// The seam of the FTM sequencer, which can collect requests, record them and hold them back.
//
// A connection has none unless one is set in its ftm::Settings; requests then go out at once. Sequencer commands of the
// caller (mode id 37) are passed on to the handset in that case.
#ifndef KRAL_COMMANDS_FTM_FTM_SEQUENCER_H
#define KRAL_COMMANDS_FTM_FTM_SEQUENCER_H

#include <cstddef>
#include <cstdint>
#include <span>

namespace kral {

class Diag_FTM;

class FtmSequencer {
 public:
  virtual ~FtmSequencer() = default;

  // --- Queue mode ---
  // False when the queue is full; else the number given to the request.
  virtual bool Add(std::span<const uint8_t> request, uint16_t& sequence_id) = 0;
  virtual size_t queued() const = 0;
  virtual bool SendQueue(Diag_FTM& phone) = 0;  // hands the queued commands to the handset
  virtual void ClearQueue() = 0;

  // --- Adaptation layer ---
  // A sequencer command of the caller: gives the layer's code, 0 for success.
  virtual uint32_t Process(Diag_FTM& phone, std::span<const uint8_t> command) = 0;
  virtual bool active() const = 0;
  virtual void Observe(std::span<const uint8_t> request) = 0;
  virtual bool holds_back() const = 0;  // batch mode
};

}  // namespace kral

#endif
