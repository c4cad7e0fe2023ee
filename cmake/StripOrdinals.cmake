# Turns the linker's .def file into one that names its DLL and no ordinals: INPUT -> OUTPUT.
file(READ ${INPUT} text)
string(REGEX REPLACE " @[0-9]+" "" text "${text}")
file(WRITE ${OUTPUT} "LIBRARY kral.dll\n${text}")
