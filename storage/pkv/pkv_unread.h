// What a PKV file holds that looks like items or files of the handset, and that no reader can take as such.
#ifndef KRAL_STORAGE_PKV_PKV_UNREAD_H
#define KRAL_STORAGE_PKV_PKV_UNREAD_H

#include <string>
#include <vector>

#include "platform/compound_file.h"

namespace kral::pkv {

// A line for each part: where it is, and why it is passed over. Parts that are carried, and those that nobody knows,
// are not among them; damaged ones are the readers' to refuse.
std::vector<std::string> UnreadParts(const CompoundStorage& configuration);

}  // namespace kral::pkv

#endif
