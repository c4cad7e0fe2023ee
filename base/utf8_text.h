// Texts of handsets and files made fit for terminals and for readers that insist on UTF-8.
#ifndef KRAL_BASE_UTF8_TEXT_H
#define KRAL_BASE_UTF8_TEXT_H

namespace kral {

// In place: control characters (C1 as well) and bytes that are no UTF-8 become '?'; a character that was cut off at
// the end goes.
void MakePrintableUtf8(char* text);

}  // namespace kral

#endif
