// One or more examples of every verb.
#include "tools/kral/examples.h"

#include "tools/kral/command_line.h"

namespace kral::tool {
namespace {

constexpr const char* kExamples[] = {
    "kral ports --probe",
    "kral ports assign 3 usb:1-4.2",
    "kral doctor",
    "kral -p 7 doctor --seconds 10",
    "kral -p slot:1-8 info --wait",
    "kral -p 7 info",
    "kral -p 7 --json info",
    "kral --all info",
    "kral -p 7 mode get",
    "kral -p 7 mode ftm",
    "kral -p 7 mode online",
    "kral -p 7 mode offline",
    "kral -p 7 mode lpm",
    "kral -p 7 mode reset",
    "kral -p 7 ftm mode 9",
    "kral -p 7 ftm chan 9750 --rf-mode 9",
    "kral -p 7 ftm tx on --rf-mode 9",
    "kral -p 7 ftm cmd GET_RX_AGC",
    "kral -p 7 ftm cmd 53 01 00 --mode-id 1",
    "kral ftm list",
    "kral -p 7 nv read 453 10",
    "kral -p 7 nv read FTM_MODE --defs nv_definitions.xml",
    "kral -p 7 nv write FTM_MODE 1 --defs nv_definitions.xml",
    "kral -p 7 nv write 453 01",
    "kral -p 7 nv dump --items 0-999 --pkv values.pkv",
    "kral nv diff before.pkv after.pkv difference.html",
    "kral nv defs nv_definitions.xml",
    "kral -p 7 nv backup phone.pkv",
    "kral -p 7-14 nv backup {serial}.pkv --jobs 4",
    "kral -p 7 nv restore phone.pkv --dry-run",
    "kral -p 7 nv restore golden.pkv --force",
    "kral -p 7 nv restore phone.pkv --read-only 0,447",
    "kral -p 7 nv verify phone.pkv",
    "kral band list",
    "kral band ul 1 60",
    "kral band dl 1 60",
    "kral -p 7 fs cat :/nv/item_files/conf/version",
    "kral -p 7 fs df",
    "kral -p 7 fs get -r :/nv backup",
    "kral -p 7 fs ln :/nv/item_files :/items",
    "kral -p 7 fs ls :/nv",
    "kral -p 7 fs mkdir --parents :/nv/item_files/rfnv",
    "kral -p 7 fs mv :/a :/b",
    "kral -p 7 fs put -r rf-config :/nv/item_files",
    "kral -p 7 fs rm :/a :/b",
    "kral -p 7 fs rm -r :/nv/item_files/old",
    "kral -p 7 fs rmdir :/empty",
    "kral -p 7 fs stat :/nv/item_files",
    "kral -p 7 fs sync",
    "kral -p 7 fs tree :/nv",
    "kral -p 7 log list --names log_names.txt",
    "kral -p 7 log on 0x1001 0x1010-0x101F",
    "kral -p 7 log off --all",
    "kral -p 7 log capture traffic.cap --on 0x1001 --seconds 10",
    "kral log play traffic.cap",
    "kral -p 7 log stats --seconds 10",
    "kral log stats traffic.cap",
    "kral -p 7 event on 290-299",
    "kral -p 7 event off --all",
    "kral -p 7 event tail --on 291 --count 20",
    "kral -p 7 flash info",
    "kral -p 7 flash load programmer.hex",
    "kral -p 7 flash write --security 1 --partition table.mbn 2:boot.bin 5:modem.hex",
    "kral -p 7 flash reset",
    "kral flash write --dry-run 2:boot.bin 5:modem.hex",
    "kral flash verify-image modem.hex boot.bin",
    "kral flash hex modem.hex modem.bin",
    "kral flash hex boot.bin boot.hex --base 0x20000",
    "kral -p 7 flash all programmer.bin 2:boot.bin 5:modem.hex --reset",
    "kral -p 7 boot info",
    "kral -p 7 boot load programmer.bin --enter",
    "kral -p 7 raw 4B 0F 00 00",
    "kral sim --link com7",
    "kral sim --count 8 --ports ports --rate 250k --fault-at 3:lose,of=08",
    "kral sim --model TESTER-9 --fault refuse=19,of=7C",
    "kral help fs get",
};

}  // namespace

void AddExamples(CommandLine& command_line) {
  for (const auto* example : kExamples) command_line.Example(example);
}

}  // namespace kral::tool
