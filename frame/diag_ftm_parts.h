// The part of a phone object that its threads share. A thread that does not end in time keeps it alive, so that
// nothing is freed under it.
#ifndef KRAL_FRAME_DIAG_FTM_PARTS_H
#define KRAL_FRAME_DIAG_FTM_PARTS_H

#include <optional>

#include "frame/diag_ftm.h"
#include "transport/collection/capture_player.h"
#include "transport/collection/capture_writer.h"
#include "transport/collection/name_table.h"
#include "transport/engine/kral_events.h"
#include "transport/trace/trace_writer.h"

namespace kral {

struct Diag_FTM::Parts {
  explicit Parts(Clock& clock) : log(clock) {
    sorter.SetNames(&names);
    sorter.SetCapture(&capture);
  }

  DataLogFileHandler log;
  PacketQueue responses;
  PacketQueue asynchronous;
  BoundedQueue<EventRecord> events;
  NameTables names;
  CaptureWriter capture{log};
  CKralEventListener sorter{responses, asynchronous, events, log};
  CKralEvents dispatcher;
  CapturePlayer player;
  TraceWriter trace{log};
  std::optional<CKralThreadInterface> transport;  // direct mode
};

}  // namespace kral

#endif
