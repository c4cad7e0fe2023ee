// Where the output of one handset goes while a verb works on several: to whoever shows them all together.
#ifndef KRAL_TOOLS_LANE_H
#define KRAL_TOOLS_LANE_H

#include <cstdint>
#include <string>
#include <string_view>

#include "tools/kral/json.h"

namespace kral::tool {

// How far long work has come.
struct WorkShown {
  std::string work;     // "put"
  std::string subject;  // "/nv/item"; empty for none
  std::uint64_t done = 0;
  std::uint64_t total = 0;  // 0: unknown
  std::string figures;      // "45 %  1.2 MiB/s  0:07 left"
  Json event;               // the same as an object
};

// Of one handset, whose thread calls it.
class Lane {
 public:
  virtual ~Lane() = default;

  virtual void Data(std::string_view text) = 0;  // of a person
  virtual void Object(const Json& members) = 0;  // with --json instead
  virtual void Note(std::string_view text) = 0;
  virtual void Show(const WorkShown& shown) = 0;
};

}  // namespace kral::tool

#endif
