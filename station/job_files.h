// The files of a job: each is opened, checked and decoded once, however many steps and handsets need it.
#ifndef KRAL_STATION_JOB_FILES_H
#define KRAL_STATION_JOB_FILES_H

#include <map>
#include <string>

#include "station/step.h"

namespace kral::station {

class JobFiles {
 public:
  // Gives the step what its file is made of. False with the failure noted, which names the file.
  bool Open(Step& step);

 private:
  bool OpenBoot(Step& step);
  bool OpenHex(Step& step);
  bool OpenTable(Step& step);
  bool OpenImage(Step& step);
  bool OpenSet(Step& step);

  // By path; of images also by format and header.
  std::map<std::string, std::shared_ptr<const OpenedImage>> images_;
  std::map<std::string, std::shared_ptr<const pkv::PkvSet>> sets_;
};

}  // namespace kral::station

#endif
