// Who is told of a port's end beside those who wait for a reply.
#ifndef KRAL_TRANSPORT_ENGINE_PORT_WATCHER_H
#define KRAL_TRANSPORT_ENGINE_PORT_WATCHER_H

namespace kral {

class PortWatcher {
 public:
  virtual ~PortWatcher() = default;
  virtual void OnPortGone() = 0;    // all packets that came before have been dispatched, if listeners let them
  virtual void OnPortOpened() = 0;  // before the first of its packets
};

}  // namespace kral

#endif
