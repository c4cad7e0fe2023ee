// Replies and definitions as JSON texts.
#ifndef KRAL_COMMANDS_DEFINED_REPLY_TEXT_H
#define KRAL_COMMANDS_DEFINED_REPLY_TEXT_H

#include <string>

#include "commands/defined/values.h"

namespace kral::defined {

// One object: numbers, words of enumerations, texts, blocks as hexadecimal digits, groups as objects, arrays.
std::string ReplyText(const Values& values);

// Name, id, frame and documentation of a command, and all fields of its request and reply.
std::string DescriptionText(const Command& command);

}  // namespace kral::defined

#endif
