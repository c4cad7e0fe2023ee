-- The dissector of kral's traces (pcapng files with the link types USER0 and USER1): commands and answers of a
-- handset, what it sends unasked, refusals, and which answer belongs to which request.
--
--   tshark -X lua_script:kral.lua -r trace.pcapng -V
--
-- Commands of definition files are shown with their fields: the preference kral.definitions, or KRAL_COMMANDS in the
-- environment, names the files, with semicolons between them.
--
-- docs/traffic.md lists the fields. Nothing is read before it is known to be there: files may be cut and hostile.

local kral = Proto("kral", "Handset diagnostics")
local kral_bytes = Proto("kral_bytes", "Bytes of a handset's port")

-- --- Names --------------------------------------------------------------------------------------------------------

local commands = {
  [0] = "Version", [2] = "Peek bytes", [3] = "Peek words", [4] = "Peek double words", [5] = "Poke bytes",
  [6] = "Poke words", [7] = "Poke double words", [16] = "Log", [19] = "Bad command", [20] = "Bad parameter",
  [21] = "Bad length", [24] = "Bad mode", [31] = "Message (31)", [32] = "Key press", [38] = "NV read",
  [39] = "NV write", [41] = "Mode control", [42] = "Error log read", [43] = "Error log clear", [47] = "Get switches",
  [48] = "Set switches", [58] = "Enter download", [59] = "FTM (59)", [65] = "Service code", [68] = "Unframed mode",
  [75] = "Subsystem", [96] = "Events", [112] = "IS-2000 status", [115] = "Log configuration", [121] = "Message",
  [123] = "Loopback", [124] = "Extended build id", [125] = "Message configuration", [128] = "Subsystem (128)",
  [129] = "Get event mask", [130] = "Set event mask", [146] = "Unsolicited (146)", [255] = "Security freeze",
}
local refusals = { [19] = true, [20] = true, [21] = true, [24] = true }
local unasked = { [16] = true, [31] = true, [96] = true, [121] = true, [146] = true }

local FTM, EFS, NV = 11, 19, 48
local subsystems = { [4] = "Service", [FTM] = "FTM", [15] = "Mode", [EFS] = "EFS", [NV] = "NV",
  [50] = "Diagnostic service", [55] = "NV backup" }
local subsystem_commands = {
  [4] = { [14] = "Status" }, [15] = { [0] = "Operating mode" }, [50] = { [3] = "Ping" },
  [NV] = { [0] = "NV write batch", [1] = "NV read extended", [2] = "NV write extended" },
}

local ftm_modes = {
  [0] = "FTM_MODE_ID_CDMA_1X", [1] = "FTM_MODE_ID_WCDMA", [2] = "FTM_MODE_ID_GSM", [3] = "FTM_MODE_ID_CDMA_1X_RX1",
  [4] = "FTM_MODE_ID_BLUETOOTH", [7] = "FTM_MODE_ID_CDMA_1X_CALL", [8] = "FTM_MODE_ID_HDR_C",
  [9] = "FTM_MODE_ID_LOGGING", [10] = "FTM_MODE_ID_AGPS", [11] = "FTM_MODE_ID_PMIC", [13] = "FTM_MODE_GSM_BER",
  [14] = "FTM_MODE_ID_AUDIO", [15] = "FTM_MODE_ID_CAMERA", [16] = "FTM_MODE_WCDMA_BER",
  [17] = "FTM_MODE_ID_GSM_EXTENDED_C", [18] = "FTM_MODE_CDMA_API_V2", [19] = "FTM_MODE_ID_ZEFT_C",
  [20] = "FTM_MODE_RF_COMMON", [21] = "FTM_MODE_WCDMA_RX1", [22] = "FTM_MODE_WLAN", [29] = "FTM_MODE_ID_LTE",
  [30] = "FTM_MODE_LTE_NS", [32] = "FTM_MODE_ID_CDMA_1X_C2", [35] = "FTM_MODE_LTE_RX1", [36] = "FTM_MODE_RFNV",
  [38] = "FTM_MODE_SV", [39] = "FTM_MODE_RFM_C", [40] = "FTM_MODE_ID_1X_C3_C", [41] = "FTM_MODE_ID_RFCA_MAL_C",
  [42] = "FTM_MODE_ID_TDSCDMA", [43] = "FTM_MODE_ID_TDSCDMA_RX1", [44] = "FTM_MODE_ID_TDSCDMA_BER",
  [47] = "FTM_MODE_ID_LTE_C3", [48] = "FTM_MODE_ID_LTE_C4", [49] = "FTM_MODE_ID_GSM_C2",
  [50] = "FTM_MODE_ID_GSM_EXTENDED_C2", [51] = "FTM_MODE_ID_GSM_BER_C2", [32768] = "FTM_MODE_ID_PRODUCTION",
  [32769] = "FTM_MODE_ID_LTM",
}
-- A few ids serve two names: the technology decides.
local ftm_commands = {
  [2] = "SET_TX_ON", [3] = "SET_TX_OFF", [7] = "SET_MODE", [8] = "SET_CHAN", [11] = "GSM_CAPTURE_IQ",
  [16] = "GET_SYNTH_STATE", [17] = "SET_SMPS_PA_BIAS_VAL", [18] = "SET_SMPS_PA_BIAS_OVERRIDE",
  [50] = "CDMA_CW_WAVEFORM", [53] = "GET_RX_AGC", [54] = "SET_PA_RANGE", [58] = "SET_LNA_RANGE",
  [59] = "GET_ADC_VAL", [81] = "SET_LNA_OFFSET", [111] = "SET_DVGA_OFFSET", [114] = "GET_CDMA_IM2",
  [115] = "SET_FREQ_SENSE_GAIN", [116] = "TX_SWEEP_CAL", [117] = "GET_DVGA_OFFSET", [118] = "GET_LNA_OFFSET",
  [119] = "GET_HDET_FROM_TX_SWEEP_CAL", [120] = "GET_FM_IQ", [122] = "GET_CTON", [124] = "SET_HDET_TRACKING",
  [125] = "CONFIGURE_TX_SWEEP_CAL / LTE_CONFIGURE_TX_SWEEP_CAL", [126] = "GET_CDMA_IM2_WITH_SUPPRESSSION",
  [127] = "GET_ALL_HDET_FROM_TX_SWEEP_CAL / LTE_GET_ALL_HDET_FROM_TX_SWEEP_CAL", [128] = "SET_RF_POWER_MODE",
  [129] = "SET_TX_SWEEP_STEP_SIZE", [133] = "DO_DC_CAL", [136] = "SET_TX_WAVEFORM", [143] = "DO_IQ_MISMATCH_CAL",
  [144] = "GET_ALL_HDET_FROM_TX_SWEEP_CAL_V2", [153] = "SET_BLOCK_MASK", [161] = "ENABLE_LPM_HDET",
  [162] = "GET_LPM_HDET_FROM_TX_SWEEP_CAL", [163] = "GET_ALL_LPM_HDET_FROM_TX_SWEEP_CAL",
  [170] = "CONFIG_EUL_WAVEFORM", [172] = "DISABLE_EUL_WAVEFORM", [173] = "WCDMA_SET_TXAGC",
  [174] = "WCDMA_TXAGC_SWEEP", [175] = "SWITCH_TX_ANT", [176] = "SET_TX_POWER_DBM", [177] = "LTE_SET_NET_SIG_VALUE",
  [179] = "GET_RX_LEVEL_DBM", [180] = "SET_OFFSET_CW", [182] = "SET_PA_STATE", [185] = "LTE_SET_LNA_STATE_DBM",
  [186] = "SET_FREQ_ADJUST", [187] = "GET_MULTIPLE_RX_LEVEL_DBM / LTE_SET_TDD_PARAMS", [212] = "SET_PA_PROFILE",
  [216] = "SET_TRANSMIT_CONT", [217] = "SET_TRANSMIT_BURST", [225] = "SET_RX_BURST", [227] = "SET_TX_POWER_LEVEL",
  [230] = "GET_RSSI", [231] = "SET_PA_START_DELTA", [232] = "SET_PA_STOP_DELTA", [233] = "SET_PA_DAC_INPUT",
  [234] = "SET_RX_CONTINUOUS", [235] = "SET_TX_CAL_SWEEP", [236] = "DO_GSM_AUTOCAL", [239] = "SET_AMAM_TABLE_DC",
  [240] = "SET_TX_FRAME_MATRIX", [241] = "ENABLE_POLAR_REF_CAL", [242] = "SET_TWOTONE_FREQ_OFFSET",
  [243] = "DO_CALPATH_RSB", [245] = "SET_OPLL_BW", [250] = "BASEBAND_BW_CAL", [251] = "GSM_DO_TX_KV_CAL",
  [310] = "DA_CAL", [400] = "ZEFT_GET_RSSI_CAL_POINT", [401] = "ZEFT_GET_RX_RSSI", [402] = "ZEFT_GET_AGC_STATE",
  [403] = "ZEFT_WRITE_CAL_DATA", [406] = "ZEFT_LNA_SELECT", [407] = "ZEFT_RF_SWITCH_CONFIG",
  [408] = "ZEFT_SYNTH_LOCK", [411] = "ZEFT_SET_GAIN_STATE", [413] = "ZEFT_TUNE_PLL", [415] = "ZEFT_GET_IM2",
  [600] = "GET_CAGC_DUAL_CARRIER_RX_AGC", [601] = "SET_DUAL_CARRIER_DVGA_OFFSET",
  [602] = "GET_DUAL_CARRIER_DVGA_OFFSET", [603] = "SET_MULTI_CHAN / SET_MULTI_CHAN_ENH",
  [703] = "TDSCDMA_IQ_LOGGING", [712] = "TDSCDMA_SET_BURST_TX_PARAMS", [713] = "TDSCDMA_BURST_TX",
  [714] = "TDSCDMA_BURST_RX", [715] = "TDSCDMA_SWITCH_TX_WAVEFORM", [849] = "SET_TUNER_PROGRAM_SCENARIO",
  [850] = "SET_TUNER_SCENARIO_OVERRIDE", [861] = "SET_TUNER_TUNE_CODE_OVERRIDE", [865] = "GSM_V4_CAL_EXECUTE_SWEEP",
  [901] = "IQ_CAPTURE_ACQUIRE_SAMPLES", [902] = "IQ_CAPTURE_GET_SAMPLES", [903] = "IQ_CAPTURE_ANALYZE_SAMPLES",
  [911] = "RF_MEAS_TX_PARAMS", [913] = "FBRX_IQ_CAPTURE_TRIGGER", [914] = "FBRX_IQ_CAPTURE_GET_SAMPLES",
}

local nv_statuses = { [0] = "done", [5] = "never written", [6] = "unknown item", [7] = "read-only" }
local log_operations = { [1] = "ranges", [3] = "set mask", [4] = "get mask" }

-- Of each operation its name and what stands behind the header in request and answer: pairs of kind and field. "path"
-- is a text up to its zero, "data" the rest. What stands at the end of an answer is "last32".
local efs_operations = {
  [2] = { "Open", { "u32", "flags", "u32", "mode", "path", "path" }, { "u32", "fd", "u32", "errno" } },
  [3] = { "Close", { "u32", "fd" }, { "u32", "errno" } },
  [4] = { "Read", { "u32", "fd", "u32", "count", "u32", "offset" },
    { "u32", "fd", "u32", "offset", "u32", "count", "u32", "errno", "data", "data" } },
  [5] = { "Write", { "u32", "fd", "u32", "offset", "data", "data" },
    { "u32", "fd", "u32", "offset", "u32", "count", "u32", "errno" } },
  [6] = { "Symbolic link", { "path", "path", "path", "path2" }, { "u32", "errno" } },
  [7] = { "Read link", { "path", "path" }, { "u32", "errno", "path", "path" } },
  [8] = { "Unlink", { "path", "path" }, { "u32", "errno" } },
  [9] = { "Make directory", { "u16", "mode", "path", "path" }, { "u32", "errno" } },
  [10] = { "Remove directory", { "path", "path" }, { "u32", "errno" } },
  [11] = { "Open directory", { "path", "path" }, { "u32", "fd", "u32", "errno" } },
  [12] = { "Read directory", { "u32", "fd", "u32", "sequence" },
    { "u32", "fd", "u32", "sequence", "u32", "errno", "u32", "type", "u32", "mode", "u32", "size", "u32", "atime",
      "u32", "mtime", "u32", "ctime", "path", "path" } },
  [13] = { "Close directory", { "u32", "fd" }, { "u32", "errno" } },
  [14] = { "Rename", { "path", "path", "path", "path2" }, { "u32", "errno" } },
  [15] = { "Stat", { "path", "path" }, { "u32", "errno", "u32", "mode", "u32", "size" } },
  [18] = { "Change mode", { "u16", "mode", "path", "path" }, { "u32", "errno" } },
  [19] = { "File system status", { "path", "path" }, { "u32", "errno" } },
  [20] = { "Access", { "u16", "mode", "path", "path" }, { "u32", "errno" } },
  [21] = { "Device info", {}, { "u32", "errno" } },
  [29] = { "Extended info", { "u32", "query" }, { "u32", "errno" } },
  [38] = { "Put item", { "u32", "size", "u32", "flags", "u16", "sequence", "data", "data" }, { "last32", "errno" } },
  [39] = { "Get item", { "u32", "size", "u32", "path_size", "u16", "sequence", "path", "path" },
    { "u32", "count", "u32", "errno", "u16", "sequence", "data", "data" } },
  [48] = { "Sync without wait", { "path", "path" }, { "u32", "errno", "u32", "state" } },
  [49] = { "Sync status", { "path", "path" }, { "u32", "errno", "u32", "state" } },
  [53] = { "Make golden copy", { "path", "path" }, { "u32", "errno" } },
}

-- The loader, which a handset in download runs first (its numbers are big-endian), and the flash programmer that it is
-- given.
local loader_commands = {
  [2] = "Loader acknowledged", [3] = "Loader refused", [5] = "Loader go", [6] = "Loader no operation",
  [10] = "Loader reset", [12] = "Loader version", [13] = "Loader version", [15] = "Loader write",
}
local stream_commands = {
  [1] = "Programmer hello", [2] = "Programmer hello", [7] = "Programmer write", [8] = "Programmer wrote",
  [9] = "Programmer no operation", [10] = "Programmer no operation",
  [21] = "Programmer close", [22] = "Programmer closed", [23] = "Programmer security mode",
  [24] = "Programmer security mode set", [25] = "Programmer partition table", [26] = "Programmer partition table taken",
  [27] = "Programmer open image", [28] = "Programmer image opened",
}
local hello_magic = "fast download protocol"
-- The boot loader's packets, which have no frame: the names of the words behind command and length.
local boot_commands = {
  [1] = { "Boot hello", { "version", "compatible", "most", "mode" } },
  [2] = { "Boot hello response", { "version", "compatible", "status", "mode" } },
  [3] = { "Boot read data", { "image", "offset", "size" } },
  [4] = { "Boot end of transfer", { "image", "status" } },
  [5] = { "Boot done", {} }, [6] = { "Boot done response", { "status" } },
  [11] = { "Boot command ready", {} }, [12] = { "Boot switch mode", { "mode" } },
  [13] = { "Boot execute", { "client_command" } }, [14] = { "Boot execute response", { "client_command", "size" } },
  [15] = { "Boot execute data", { "client_command" } },
}

-- --- Fields -------------------------------------------------------------------------------------------------------

local f = {
  direction = ProtoField.string("kral.direction", "Direction"),
  code = ProtoField.uint8("kral.code", "Code"),
  command = ProtoField.string("kral.command", "Command"),
  payload = ProtoField.bytes("kral.payload", "Payload"),
  fcs = ProtoField.uint16("kral.fcs", "FCS", base.HEX),
  fcs_good = ProtoField.bool("kral.fcs.good", "FCS is good"),
  noise = ProtoField.bytes("kral.noise", "Bytes without a frame"),
  request_in = ProtoField.framenum("kral.request_in", "Request in", base.NONE, frametype.REQUEST),
  reply_in = ProtoField.framenum("kral.reply_in", "Answer in", base.NONE, frametype.RESPONSE),
  time = ProtoField.relative_time("kral.time", "Time since the request"),
  refused = ProtoField.uint8("kral.refused", "Refused code"),
  refusal = ProtoField.string("kral.refusal", "Refusal"),
  subsystem = ProtoField.uint8("kral.subsystem", "Subsystem"),
  subsystem_command = ProtoField.uint16("kral.subsystem.command", "Subsystem command"),
  ftm_mode = ProtoField.uint16("kral.ftm.mode", "FTM mode", base.DEC, ftm_modes),
  ftm_command = ProtoField.uint16("kral.ftm.command", "FTM command", base.DEC, ftm_commands),
  nv_item = ProtoField.uint16("kral.nv.item", "NV item"),
  nv_index = ProtoField.uint8("kral.nv.index", "Index"),
  nv_context = ProtoField.uint16("kral.nv.context", "Subscription"),
  nv_status = ProtoField.uint16("kral.nv.status", "NV status", base.DEC, nv_statuses),
  nv_count = ProtoField.uint16("kral.nv.count", "NV items"),
  efs_operation = ProtoField.string("kral.efs.operation", "EFS operation"),
  log_length = ProtoField.uint16("kral.log.length", "Log length"),
  log_code = ProtoField.uint16("kral.log.code", "Log code", base.HEX),
  log_equipment = ProtoField.uint16("kral.log.equipment_id", "Equipment id"),
  log_item = ProtoField.uint16("kral.log.item", "Log item"),
  log_stamp = ProtoField.uint64("kral.log.stamp", "Time stamp", base.HEX),
  log_operation = ProtoField.uint32("kral.log.operation", "Operation", base.DEC, log_operations),
  event_size = ProtoField.uint16("kral.event.size", "Bytes of events"),
  event_id = ProtoField.uint16("kral.event.id", "Event"),
  event_stamp = ProtoField.bytes("kral.event.stamp", "Time stamp"),
  event_payload = ProtoField.bytes("kral.event.payload", "Event payload"),
  message_stamp = ProtoField.uint64("kral.message.stamp", "Time stamp", base.HEX),
  message_line = ProtoField.uint16("kral.message.line", "Line"),
  message_category = ProtoField.uint16("kral.message.category", "Category"),
  message_level = ProtoField.uint32("kral.message.level", "Level"),
  message_argument = ProtoField.uint32("kral.message.argument", "Argument"),
  message_text = ProtoField.string("kral.message.text", "Text"),
  message_file = ProtoField.string("kral.message.file", "File"),
  address = ProtoField.uint32("kral.address", "Address", base.HEX),
  count = ProtoField.uint16("kral.count", "Count"),
  mode = ProtoField.uint16("kral.mode", "Mode"),
  switches = ProtoField.uint16("kral.switches", "Switches", base.HEX),
  protocol = ProtoField.string("kral.protocol", "Protocol"),
  download_status = ProtoField.uint8("kral.download.status", "Status"),
  download_data = ProtoField.bytes("kral.download.data", "Data"),
  download_block = ProtoField.uint32("kral.download.block_size", "Block size"),
  download_id = ProtoField.string("kral.download.flash_id", "Flash id"),
  download_type = ProtoField.uint8("kral.download.type", "Type"),
  boot_command = ProtoField.uint32("kral.boot.command", "Boot command"),
  boot_length = ProtoField.uint32("kral.boot.length", "Length"),
  defined = ProtoField.string("kral.defined", "Command by definition"),
  defined_field = ProtoField.string("kral.defined.field", "Field"),
}
for _, name in ipairs({ "version", "compatible", "most", "mode", "status", "image", "offset", "size",
  "client_command" }) do
  f["boot_" .. name] = ProtoField.uint32("kral.boot." .. name, "Boot " .. name)
end
for _, name in ipairs({ "fd", "flags", "mode", "count", "offset", "errno", "sequence", "type", "size", "atime", "mtime",
  "ctime", "query", "path_size", "state" }) do
  f["efs_" .. name] = ProtoField.uint32("kral.efs." .. name, "EFS " .. name)
end
f.efs_path = ProtoField.string("kral.efs.path", "Path")
f.efs_path2 = ProtoField.string("kral.efs.path2", "Second path")
f.efs_data = ProtoField.bytes("kral.efs.data", "Data")
kral.fields = f

local bad_fcs = ProtoExpert.new("kral.fcs.bad", "The FCS does not fit", expert.group.CHECKSUM, expert.severity.WARN)
local cut = ProtoExpert.new("kral.cut", "Shorter than its header says", expert.group.MALFORMED, expert.severity.WARN)
local refused = ProtoExpert.new("kral.refused.by_handset", "Refused", expert.group.RESPONSE_CODE, expert.severity.NOTE)
local not_as_defined = ProtoExpert.new("kral.defined.wrong", "Not as the definition has it", expert.group.MALFORMED,
  expert.severity.WARN)
kral.experts = { bad_fcs, cut, refused, not_as_defined }
kral.prefs.definitions = Pref.string("Definition files", "", "Of commands, with semicolons between them")

-- --- Reading ------------------------------------------------------------------------------------------------------

-- The bytes of a frame in front of its FCS, and how far they have been read.
local Reader = {}
Reader.__index = Reader

function Reader.new(tvb, size, tree)
  return setmetatable({ tvb = tvb, size = size, at = 0, tree = tree }, Reader)
end

function Reader:has(count)
  return count >= 0 and self.at + count <= self.size
end

local sizes = { u8 = 1, u16 = 2, u32 = 4, u64 = 8 }

-- Adds the field and gives its number; nil, and nothing is added, where the bytes are not there.
function Reader:number(kind, field, tree)
  local size = sizes[kind]
  if not self:has(size) then
    self.at = self.size + 1 -- what follows is not there either
    return nil
  end
  local range = self.tvb(self.at, size)
  self.at = self.at + size
  if field then (tree or self.tree):add_le(field, range) end
  return size < 8 and range:le_uint() or 0
end

function Reader:bytes(count, field, tree)
  if count <= 0 or not self:has(count) then return end
  if field then (tree or self.tree):add(field, self.tvb(self.at, count)) end
  self.at = self.at + count
end

function Reader:rest(field)
  self:bytes(self.size - self.at, field)
end

-- A text up to its zero, or as far as there is any.
function Reader:text(field)
  if not self:has(1) then return nil end
  local size = 0
  while self.at + size < self.size and self.tvb(self.at + size, 1):uint() ~= 0 do size = size + 1 end
  local range = self.tvb(self.at, math.min(size + 1, self.size - self.at))
  local text = size > 0 and self.tvb(self.at, size):string() or ""
  self.tree:add(field, range, text)
  self.at = self.at + range:len()
  return text
end

-- --- Definition files ---------------------------------------------------------------------------------------------
-- They are read as far as it takes to show fields; whether one contradicts itself is the library's to say. Like packets
-- they may be hostile: every loop and every depth has a bound.

local MOST_XML, MOST_ELEMENTS, DEEPEST = 16 * 1024 * 1024, 200000, 32

-- As UTF-8.
local function character(code)
  if code < 0x80 then return string.char(code) end
  local tail = ""
  local room = 0x40
  while code >= room do
    tail = string.char(0x80 + code % 0x40) .. tail
    code, room = math.floor(code / 0x40), room == 0x40 and 0x20 or room / 2
  end
  return string.char(0x100 - 2 * room + code) .. tail
end

-- The encodings that the library's parsers know everywhere: UTF-8, UTF-16 and Latin-1.
local function as_utf8(text)
  local first, second = text:byte(1, 2)
  if first == 0xEF then return text:sub(4) end
  local big = first == 0xFE or first == 0
  if big or first == 0xFF or second == 0 then
    local lead
    return (text:sub((first == 0xFE or first == 0xFF) and 3 or 1):gsub("(.)(.?)", function(one, other)
      if other == "" then error("half a character", 0) end
      local code = big and one:byte() * 256 + other:byte() or other:byte() * 256 + one:byte()
      if code >= 0xD800 and code < 0xDC00 then
        lead = code
        return ""
      end
      if lead and code >= 0xDC00 and code < 0xE000 then code = 0x10000 + (lead - 0xD800) * 0x400 + code - 0xDC00 end
      lead = nil
      return character(code)
    end))
  end
  local encoding = text:match("^<%?xml[^>]-encoding%s*=%s*[\"']([%w_.-]+)")
  if encoding and encoding:lower() == "iso-8859-1" then
    return (text:gsub("[\128-\255]", function(byte) return character(byte:byte()) end))
  end
  return text
end

local entities = { lt = "<", gt = ">", amp = "&", quot = '"', apos = "'" }
local function unescaped(text)
  return (text:gsub("&(#?%w+);", function(name)
    if entities[name] then return entities[name] end
    local code = name:match("^#(%d+)$") and tonumber(name:sub(2)) or name:match("^#x%x+$") and tonumber(name:sub(3), 16)
    if not code or code == 0 or code > 0x10FFFF then error("there is no character &" .. name .. ";", 0) end
    return character(code)
  end))
end

-- Elements with `name`, `attributes` and their children; raises the fault as a text.
local function parse_xml(text)
  local root = { name = "", attributes = {} }
  local stack, at, elements = { root }, 1, 0
  while true do
    local open = text:find("<", at, true)
    if text:find("%S", at) ~= open and unescaped(text:sub(at, (open or 0) - 1)):find("%S") then
      error("text between elements", 0)
    end
    if not open then break end
    local blanks_end = text:match("^<!%[CDATA%[%s*%]%]()>", open)
    local skipped = text:sub(open, open + 3) == "<!--" and "-->" or text:sub(open, open + 1) == "<?" and "?>" or
      blanks_end and "]]>"
    if skipped then
      local _, last = text:find(skipped, open, true)
      if not last then error("a comment without end", 0) end
      at = last + 1
    elseif text:sub(open + 1, open + 1) == "/" then
      local name, last = text:match("^</([%w_:.-]+)%s*>()", open)
      if #stack == 1 or stack[#stack].name ~= name then error("elements that do not nest", 0) end
      stack[#stack] = nil
      at = last
    else
      local name, next_at = text:match("^<([%a_][%w_:.-]*)()", open)
      if not name then error("no element of a definition file", 0) end
      elements = elements + 1
      if elements > MOST_ELEMENTS or #stack > DEEPEST then error("too many elements", 0) end
      local element = { name = name, attributes = {} }
      while true do
        local key, quote, value_at = text:match("^%s+([%w_:.-]+)%s*=%s*([\"'])()", next_at)
        if not key then break end
        local value_end = text:find(quote, value_at, true)
        if not value_end then error("an attribute without end", 0) end
        element.attributes[key] = unescaped(text:sub(value_at, value_end - 1))
        next_at = value_end + 1
      end
      local slash, last = text:match("^%s*(/?)>()", next_at)
      if not slash then error("no element of a definition file", 0) end
      table.insert(stack[#stack], element)
      if slash == "" then stack[#stack + 1] = element end
      at = last
    end
  end
  if #stack > 1 or #root ~= 1 then error("not one whole element", 0) end
  return root[1]
end

-- Commands by what stands in front of their fields.
local function no_definitions()
  return { subsystem = {}, diag = {}, ftm = {}, ftm_any = {}, ftm59 = {} }
end
local defined, defined_from = no_definitions(), ""

local function child_of(element, name)
  for _, child in ipairs(element) do
    if child.name == name then return child end
  end
end

local function add_family(family, file)
  local a = family.attributes
  for _, element in ipairs(family) do
    local id = tonumber(element.attributes.id)
    if element.name == "Command" and id then
      local command = { name = (a.name or "?") .. "." .. (element.attributes.name or "?"), file = file,
        big = a.order == "big", request = child_of(element, "Request"), reply = child_of(element, "Reply"),
        skipped = (a.header == "extended" or a.header == "pmic") and 4 or 0 }
      local place = defined.diag
      if a.frame == "subsystem" then
        place, id = defined.subsystem, (tonumber(a.subsystem) or -1) * 65536 + id
      elseif a.frame == "ftm59" then
        place = defined.ftm59
      elseif a.frame == "ftm" then
        local mode = tonumber(a.mode)
        local any = not mode or element.attributes.mode == "by_rf_mode"
        place, id = any and defined.ftm_any or defined.ftm, any and id or mode * 65536 + id
      end
      place[id] = place[id] or command
    end
  end
end

local function read_definitions(path)
  local stream, problem = io.open(path, "rb")
  if not stream then error(problem, 0) end
  local text = stream:read(MOST_XML + 1) or ""
  stream:close()
  if #text > MOST_XML then error("longer than a definition file", 0) end
  local root = parse_xml(as_utf8(text))
  if root.name ~= "CommandDefinition" then error("no definition file", 0) end
  local file = { words = {}, records = {} }
  for _, element in ipairs(root) do
    local name = element.attributes.name
    if element.name == "Enumeration" and name then
      local words = { number = {}, word = {} }
      for _, value in ipairs(element) do
        local number = tonumber(value.attributes.value)
        if number and value.attributes.name then
          words.number[value.attributes.name] = number
          words.word[number] = words.word[number] or value.attributes.name
        end
      end
      file.words[name] = words
    elseif element.name == "Record" and name then
      file.records[name] = element
    end
  end
  for _, element in ipairs(root) do
    if element.name == "Family" then add_family(element, file) end
  end
end

-- Once for each setting. A file that cannot be used is told, and what others define is shown.
local function load_definitions()
  local files = kral.prefs.definitions
  if files == nil or files == "" then files = os.getenv("KRAL_COMMANDS") or "" end
  if files == defined_from then return end
  defined, defined_from = no_definitions(), files
  for path in files:gmatch("[^;]+") do
    local done, fault = pcall(read_definitions, path)
    if not done then io.stderr:write("kral.lua: " .. path .. ": " .. tostring(fault) .. "\n") end
  end
end

local kinds = { u = "unsigned", s = "signed", f = "real" }

-- A <Field> or <Bit>, made ready once.
local function compiled(element, file, big)
  if element.field then return element.field end
  local a = element.attributes
  local kind, bits = (a.type or ""):match("^([usf])(%d+)$")
  bits = tonumber(bits)
  local field = { name = a.name or "?", count = a.count, size = a.size, unit = a.unit, words = file.words[a.enum or ""],
    most_elements = tonumber(a.max_count), most_bytes = tonumber(a.max_size),
    big = a.order == "big" or (a.order == nil and big) }
  if element.name == "Bit" then
    local first, last = (a.bits or ""):match("^(%d+)-?(%d*)$")
    field.kind, field.first = a.signed == "1" and "signed" or "unsigned", tonumber(first) or 0
    field.bits = (tonumber(last) or field.first) - field.first + 1
  elseif bits and bits >= 8 and bits <= 64 and bits % 8 == 0 then
    field.kind, field.bits = element[1] and "bits" or kinds[kind], bits
  elseif a.type == "text" or a.type == "bytes" or a.type == "zlib" then
    field.kind = a.type
  else
    field.kind, field.inside = "record", file.records[a.type or ""] or element
  end
  field.inside = field.inside or element
  local number = function(word)
    return field.words and field.words.number[word] or tonumber(word)
  end
  field.most = number(a.max or "")
  if a.success then
    field.success = {}
    for word in a.success:gmatch("[^,]+") do field.success[number(word) or word] = true end
  end
  if a.when then
    local name, is_not, values = a.when:match("^([^=!]+)(!?)=(.*)$")
    field.when = name and { name = name, is_not = is_not == "!", values = values }
  end
  element.field = field
  return field
end

local Fields = {} -- one message on its way through a definition
Fields.__index = Fields

local MOST_SHOWN = 1000

-- What an earlier field has, here or in a group around.
local function value_of(scope, name)
  while scope do
    if scope.values[name] ~= nil then return scope.values[name], scope.fields[name] end
    scope = scope.outer
  end
end

function Fields:applies(when, scope)
  local value, field = value_of(scope, when.name)
  local among = false
  for word in when.values:gmatch("[^,]+") do
    local number = field and field.words and field.words.number[word] or tonumber(word)
    among = among or (number ~= nil and number == value)
  end
  return among ~= when.is_not
end

function Fields:stop(fault)
  error({ fault = fault }, 0)
end

-- A number, or what a field counts, which is `most` at most.
function Fields:amount(text, scope, most)
  local number = tonumber(text)
  if number then return number end
  local value, counter = value_of(scope, text)
  number = tonumber(value or "")
  if number and (number < 0 or number > (most or counter.most or 65535)) then
    self:stop(text .. "=" .. string.format("%.0f", number) .. " is no count that it may have")
  end
  return number
end

function Fields:take(count)
  local reader = self.reader
  if not count or count < 0 or not reader:has(count) then self:stop("bytes are missing") end
  reader.at = reader.at + count
  return count > 0 and reader.tvb(reader.at - count, count) or nil
end

function Fields:show(field, path, value, range)
  self.shown = self.shown + 1
  if self.shown > MOST_SHOWN then self:stop() end
  local text = path .. "=" .. value
  local tree = self.reader.tree
  local item = range and tree:add(f.defined_field, range, text) or tree:add(f.defined_field, text)
  if field.unit then item:append_text(" " .. field.unit) end
end

-- Whether a stream, which ends with a checksum, is a whole one of these bytes.
local function is_whole_stream(range, plain)
  local low, high = 1, 0
  for at = 1, #plain do
    low = (low + plain:byte(at)) % 65521
    high = (high + low) % 65521
  end
  return range:len() > 6 and range(range:len() - 4, 4):uint() == high * 65536 + low
end

-- Of a number the value to show, and as a number to look at.
local function number_in(field, range)
  local size = field.bits / 8
  if field.kind == "real" then
    local value = field.big and range:float() or range:le_float()
    return string.format(size == 4 and "%.7g" or "%.15g", value), value
  end
  local signed = field.kind == "signed"
  if size <= 4 then
    local value
    if signed then value = field.big and range:int() or range:le_int() end
    if not signed then value = field.big and range:uint() or range:le_uint() end
    return tostring(value), value
  end
  local value
  if signed then value = field.big and range:int64() or range:le_int64() end
  if not signed then value = field.big and range:uint64() or range:le_uint64() end
  return tostring(value), value:tonumber()
end

local function bits_in(part, word)
  local value = word:rshift(part.first):band(UInt64.new(0xFFFFFFFF, 0xFFFFFFFF):rshift(64 - part.bits))
  local number = value:tonumber()
  if part.kind == "signed" and number >= 2 ^ (part.bits - 1) then
    number = number - 2 ^ part.bits
    return string.format("%.0f", number), number
  end
  return tostring(value), number
end

function Fields:keep(field, name, path, text, number, range, scope)
  scope.values[name], scope.fields[name] = number, field
  self:show(field, path, field.words and field.words.word[number] or text, range)
  if field.success and not field.success[number] then
    self.refused = name .. "=" .. text
    self:stop()
  end
end

function Fields:word(field, path, scope)
  local range = self:take(field.bits / 8)
  local word = field.big and range:uint64() or range:le_uint64()
  for _, element in ipairs(field.inside) do
    local part = compiled(element, self.file, self.big)
    if part.first + part.bits > field.bits or part.bits < 1 then self:stop("bits beyond their word") end
    local text, number = bits_in(part, word)
    self:keep(part, field.name .. "." .. part.name, path .. "." .. part.name, text, number, range, scope)
  end
end

function Fields:block(field, path, scope, depth)
  local reader = self.reader
  if field.size == "terminated" then
    local size = 0
    while reader:has(size + 1) and reader.tvb(reader.at + size, 1):uint() ~= 0 do size = size + 1 end
    if size > (field.most_bytes or size) then self:stop(field.name .. " has too many bytes") end
    local range = self:take(size)
    self:show(field, path, range and range:string() or "", range)
    self:take(1)
    return
  end
  local rest = field.size == "*" and reader.size - reader.at
  if rest and rest > (field.most_bytes or rest) then self:stop(field.name .. " has too many bytes") end
  local range = self:take(rest or self:amount(field.size or "", scope, field.most_bytes))
  if field.kind == "zlib" then
    local done, plain = pcall(function() return range:uncompress("Unpacked " .. field.name) end)
    if not range or not done or not plain then self:stop("no zlib stream") end
    local tvb = plain:tvb()
    self.reader = Reader.new(tvb, tvb:len(), reader.tree)
    self:group(field.inside, path .. ".", { values = {}, fields = {}, outer = scope }, depth + 1)
    if self.reader.at < self.reader.size then self:stop(field.name .. " holds more than defined") end
    self.reader = reader
    if not is_whole_stream(range, plain:raw()) then self:stop(field.name .. " is no whole zlib stream") end
  elseif field.kind == "text" then
    self:show(field, path, range and range:string():match("^[^%z]*") or "", range)
  else
    self:show(field, path, range and range:bytes():tohex(true) or "", range)
  end
end

function Fields:one(field, path, scope, depth)
  if field.kind == "bits" then
    self:word(field, path, scope)
  elseif field.kind == "record" then
    local inner = { values = {}, fields = {}, outer = scope }
    self:group(field.inside, path .. ".", inner, depth + 1)
    for name, value in pairs(inner.values) do
      scope.values[field.name .. "." .. name], scope.fields[field.name .. "." .. name] = value, inner.fields[name]
    end
  elseif field.kind == "text" or field.kind == "bytes" or field.kind == "zlib" then
    self:block(field, path, scope, depth)
  else
    local range = self:take(field.bits / 8)
    local text, number = number_in(field, range)
    self:keep(field, field.name, path, text, number, range, scope)
  end
end

function Fields:group(elements, prefix, scope, depth)
  if depth > DEEPEST then self:stop("groups within groups without end") end
  for _, element in ipairs(elements) do
    local field = compiled(element, self.file, self.big)
    if not field.when or self:applies(field.when, scope) then
      if not field.count then
        self:one(field, prefix .. field.name, scope, depth)
      else
        local count = field.count == "*" and math.huge or self:amount(field.count, scope, field.most_elements)
        if not count then self:stop("nothing counts " .. field.name) end
        local i = 0
        while i < count and not (field.count == "*" and self.reader.at >= self.reader.size) do
          if i >= (field.most_elements or math.huge) then self:stop(field.name .. " has too many elements") end
          local before = self.reader.at
          self:one(field, prefix .. field.name .. "[" .. i .. "]", scope, depth)
          if self.reader.at == before then self:stop("elements without bytes") end
          i = i + 1
        end
      end
    end
  end
end

-- Shows the fields of a command; gives its name, and what a status says that is none of success.
local function show_defined(reader, command, is_reply)
  if not command then return nil end
  local tree = reader.tree
  reader.tree = tree:add(f.defined, reader.tvb(0, reader.size), command.name)
  if not is_reply then reader.at = math.min(reader.at + command.skipped, reader.size) end
  local message = is_reply and command.reply or command.request
  local fields = setmetatable({ reader = reader, file = command.file, big = command.big, shown = 0 }, Fields)
  local done, why = true, nil
  if message then
    done, why = pcall(fields.group, fields, message, "", { values = {}, fields = {} }, 0)
  end
  if not done and (type(why) ~= "table" or why.fault) then
    reader.tree:add_proto_expert_info(not_as_defined, type(why) == "table" and why.fault or tostring(why))
  elseif done and reader.at < reader.size and (not is_reply or message and message.attributes.longer ~= "1" and
    reader.tvb(0, 1):uint() ~= 59) then -- answers of code 59 may be padded
    reader.tree:add_proto_expert_info(not_as_defined, "longer than defined")
  end
  reader.tree = tree
  if fields.refused then tree:add_proto_expert_info(refused, fields.refused) end
  return command.name .. (fields.refused and (", " .. fields.refused) or "")
end

-- --- Commands -----------------------------------------------------------------------------------------------------
-- Each adds its fields behind the code, and gives what the list of packets shows.

local function read_efs(reader, operation, is_reply)
  local known = efs_operations[operation]
  local name = known and known[1] or ("operation " .. operation)
  reader.tree:add(f.efs_operation, reader.tvb(2, 2), name):set_generated()
  local info = "EFS " .. name
  local layout = known and known[is_reply and 3 or 2] or {}
  for i = 1, #layout, 2 do
    local kind, field = layout[i], f["efs_" .. layout[i + 1]]
    if kind == "path" then
      local text = reader:text(field)
      if text then info = info .. " " .. text end
    elseif kind == "data" then
      reader:rest(field)
    else
      if kind == "last32" then
        kind = "u32"
        reader.at = math.max(reader.at, reader.size - 4)
      end
      local value = reader:number(kind, field)
      if value and layout[i + 1] == "errno" and value ~= 0 then info = info .. ", error " .. value end
    end
  end
  return info
end

local function read_ftm(reader, head, is_reply)
  local mode = head == 75 and reader:number("u16", f.ftm_mode) or nil
  local command = reader:number("u16", f.ftm_command)
  local known = mode and command and defined.ftm[mode * 65536 + command] or not mode and defined.ftm59[command]
  local name = show_defined(reader, known or defined.ftm_any[command], is_reply)
  if name and known then return "FTM " .. name end
  local info = "FTM"
  if mode then info = info .. " " .. (ftm_modes[mode] or ("mode " .. mode)) end
  if command then info = info .. " " .. (ftm_commands[command] or ("command " .. command)) end
  return info
end

local function nv_status_at_end(reader)
  if reader.size - 2 < reader.at then return "" end
  reader.at = reader.size - 2
  local status = reader:number("u16", f.nv_status)
  return status and status ~= 0 and (", " .. (nv_statuses[status] or ("status " .. status))) or ""
end

local function read_nv_subsystem(reader, command, is_reply)
  if command == 0 then
    reader:number("u16", f.nv_count)
    return "NV write batch"
  end
  local item = reader:number("u16", f.nv_item)
  reader:number("u16", f.nv_context)
  local info = (command == 1 and "NV read extended " or "NV write extended ") .. (item or "")
  return is_reply and info .. nv_status_at_end(reader) or info
end

local function read_subsystem(reader, is_reply, code)
  local subsystem = reader:number("u8", f.subsystem)
  if not subsystem then return "Subsystem" end
  if subsystem == FTM then return read_ftm(reader, 75, is_reply) end
  local command = reader:number("u16", f.subsystem_command)
  local name = subsystems[subsystem] or ("Subsystem " .. subsystem)
  if not command then return name end
  local known = code == 75 and show_defined(reader, defined.subsystem[subsystem * 65536 + command], is_reply)
  if known then return known end
  if subsystem == EFS then return read_efs(reader, command, is_reply) end
  if subsystem == NV and command <= 2 then return read_nv_subsystem(reader, command, is_reply) end
  local names = subsystem_commands[subsystem]
  return names and names[command] or (name .. " command " .. command)
end

local function read_nv(reader, code, is_reply)
  local item = reader:number("u16", f.nv_item)
  local info = (code == 38 and "NV read " or "NV write ") .. (item or "")
  if code == 38 and not is_reply and reader.size == 4 then reader:number("u8", f.nv_index) end
  return is_reply and info .. nv_status_at_end(reader) or info
end

local function read_log(reader)
  reader.at = 4
  local length = reader:number("u16", f.log_length)
  if length and length + 4 > reader.size then reader.tree:add_proto_expert_info(cut) end
  local code = reader:number("u16", f.log_code)
  if not code then return "Log" end
  local range = reader.tvb(reader.at - 2, 2)
  reader.tree:add(f.log_equipment, range, bit.rshift(code, 12)):set_generated()
  reader.tree:add(f.log_item, range, bit.band(code, 0xFFF)):set_generated()
  reader:number("u64", f.log_stamp)
  return string.format("Log 0x%04X", code)
end

local function read_events(reader)
  local size = reader:number("u16", f.event_size)
  local ids = {}
  if size then
    if size + 3 > reader.size then reader.tree:add_proto_expert_info(cut) end
    local all = reader.size
    reader.size = math.min(reader.size, size + 3)
    while reader:has(4) do
      local begin = reader.at
      local head = reader:number("u16")
      local stamp = head >= 0x8000 and 2 or 8
      local form = bit.band(bit.rshift(head, 13), 3)
      if not reader:has(stamp) then break end
      local id = bit.band(head, 0xFFF)
      local event = reader.tree:add(f.event_id, reader.tvb(begin, 2), id)
      reader:bytes(stamp, f.event_stamp, event)
      local payload = form
      if form == 3 then payload = reader:number("u8") or 0 end
      reader:bytes(payload, f.event_payload, event)
      if #ids < 8 then ids[#ids + 1] = id end
    end
    reader.size = all
  end
  return "Events " .. table.concat(ids, ", ")
end

local function read_message(reader)
  reader.at = 2
  local arguments = reader:number("u8")
  reader:number("u8")
  reader:number("u64", f.message_stamp)
  reader:number("u16", f.message_line)
  local category = reader:number("u16", f.message_category)
  reader:number("u32", f.message_level)
  for _ = 1, arguments or 0 do
    if not reader:number("u32", f.message_argument) then break end
  end
  local text = reader:text(f.message_text)
  reader:text(f.message_file)
  return "Message " .. (category or "") .. (text and (": " .. text) or "")
end

local function read_memory(reader, code)
  local address = reader:number("u32", f.address)
  reader:number("u16", f.count)
  return commands[code] .. (address and string.format(" 0x%08X", address) or "")
end

local function read_number(field)
  return function(reader, code)
    local value = reader:number("u16", field)
    return commands[code] .. (value and (" " .. value) or "")
  end
end

local readers = {
  [16] = read_log, [96] = read_events, [121] = read_message,
  [38] = function(reader, _, is_reply) return read_nv(reader, 38, is_reply) end,
  [39] = function(reader, _, is_reply) return read_nv(reader, 39, is_reply) end,
  [41] = read_number(f.mode),
  [47] = function(reader, code, is_reply)
    return is_reply and read_number(f.switches)(reader, code) or commands[code]
  end,
  [48] = read_number(f.switches),
  [59] = function(reader, _, is_reply)
    reader.at = 5
    return read_ftm(reader, 59, is_reply)
  end,
  [75] = function(reader, code, is_reply) return read_subsystem(reader, is_reply, code) end,
  [128] = function(reader, code, is_reply) return read_subsystem(reader, is_reply, code) end,
  [115] = function(reader)
    reader.at = 4
    local operation = reader:number("u32", f.log_operation)
    return commands[115] .. (operation and (": " .. (log_operations[operation] or operation)) or "")
  end,
}
for code = 2, 7 do readers[code] = read_memory end

-- --- Loader and flash programmer ----------------------------------------------------------------------------------
-- Their frames look like those of diagnostics: what was said before tells which they are.

local protocols = {} -- by packet
local speaks = "diagnostics" -- so far
local boot_bodies, boot_awaited = {}, nil -- by packet, the command that it is the rest of; what the next one may be

local function contains(tvb, size, text)
  return size >= 33 and tvb:raw(1, 32):find(text, 1, true) ~= nil
end

-- Codes that say so by themselves, of a length that no command of diagnostics has.
local function protocol_said_by(tvb, size, is_reply, code)
  if (code == 1 or code == 2) and contains(tvb, size, hello_magic) then return "programmer" end
  if is_reply then return nil end
  if code == 9 and size == 5 and tvb:raw(1, 3) == "NOP" then return "programmer" end
  if size == 1 and (code == 6 or code == 10 or code == 12) then return "loader" end
  if code == 15 and size >= 7 and tvb(5, 2):uint() == size - 7 then return "loader" end
end

local function protocol_of(tvb, size, pinfo, is_reply, code)
  if pinfo.visited then return protocols[pinfo.number] or "diagnostics" end
  local said = protocol_said_by(tvb, size, is_reply, code)
  if said then
    speaks = said
  elseif speaks ~= "diagnostics" then
    local names = speaks == "loader" and loader_commands or stream_commands
    if not names[code] or (is_reply and unasked[code] and speaks == "loader") then speaks = "diagnostics" end
  end
  protocols[pinfo.number] = speaks
  return speaks
end

local function read_loader(reader, code, is_reply)
  if code == 5 or code == 15 then
    if reader:has(4) then reader.tree:add(f.address, reader.tvb(reader.at, 4)) end
    reader:bytes(4)
    if code == 15 and reader:has(2) then
      reader.tree:add(f.count, reader.tvb(reader.at, 2))
      reader.at = reader.at + 2
      reader:rest(f.download_data)
    end
  elseif is_reply and code == 13 and reader:has(1) then
    reader:number("u8", f.download_type)
  end
  return loader_commands[code] or ("Loader command " .. code)
end

local function read_programmer(reader, code)
  if code == 7 or code == 8 then
    local address = reader:number("u32", f.address)
    reader:rest(f.download_data)
    return stream_commands[code] .. (address and string.format(" 0x%08X", address) or "")
  elseif code == 2 and reader:has(44) then
    reader.at = 35
    reader:number("u32", f.download_block)
    reader:number("u32", f.address)
    local length = reader:number("u8")
    reader:bytes(length or 0, f.download_id)
  elseif code == 23 or code == 27 then
    reader:number("u8", f.download_type)
  elseif code == 24 or code == 26 or code == 28 then
    local status = reader:number("u8", f.download_status)
    return stream_commands[code] .. (status and status ~= 0 and (", status " .. status) or "")
  end
  return stream_commands[code] or ("Programmer command " .. code)
end

local download_readers = { loader = read_loader, programmer = read_programmer }

-- --- Which answer belongs to which request ------------------------------------------------------------------------

local requests = {} -- those without an answer so far, by what an answer repeats of them; of each the last one
local pairs_of = {} -- by the number of either packet
local function forget()
  requests, pairs_of = {}, {}
  protocols, speaks = {}, "diagnostics"
  boot_bodies, boot_awaited = {}, nil
  load_definitions()
end
kral.init = forget

-- What an answer repeats of its request: the code, and below 75 and 128 subsystem and command. A loader's answer
-- repeats nothing, a programmer's the address of a write.
local function key_of(tvb, at, size, protocol, is_reply)
  if size < 1 then return nil end
  if protocol == "loader" then return protocol end
  if protocol == "programmer" then
    local code = tvb(0, 1):uint() - (is_reply and 1 or 0)
    return protocol .. code .. (code == 7 and size >= 5 and tvb(1, 4):bytes():tohex() or "")
  end
  local code = tvb(at, 1):uint()
  local more = (code == 75 or code == 128) and math.min(size - 1, 3) or 0
  return tvb(at, 1 + more):bytes():tohex()
end

local function pair(tvb, size, pinfo, is_reply, code, protocol)
  if pinfo.visited then return pairs_of[pinfo.number] end
  if not is_reply then
    local key = key_of(tvb, 0, size, protocol, false)
    if key then requests[key] = { number = pinfo.number, time = pinfo.rel_ts } end
    return nil
  end
  -- A refusal has the request behind its code.
  local at = protocol == "diagnostics" and refusals[code] and 1 or 0
  local key = key_of(tvb, at, size - at, protocol, true)
  local request = key and requests[key]
  if not request then return nil end
  requests[key] = nil
  local found = { request = request.number, reply = pinfo.number, time = pinfo.rel_ts - request.time }
  pairs_of[request.number], pairs_of[pinfo.number] = found, found
  return found
end

local function add_pair(found, pinfo, tree)
  if not found then return end
  if found.reply == pinfo.number then
    tree:add(f.request_in, found.request):set_generated()
    local whole = math.floor(found.time)
    tree:add(f.time, NSTime.new(whole, math.floor((found.time - whole) * 1e9 + 0.5))):set_generated()
  else
    tree:add(f.reply_in, found.reply):set_generated()
  end
end

-- --- Frames -------------------------------------------------------------------------------------------------------

local fcs_table = {}
for byte = 0, 255 do
  local value = byte
  for _ = 1, 8 do
    value = bit.band(value, 1) ~= 0 and bit.bxor(bit.rshift(value, 1), 0x8408) or bit.rshift(value, 1)
  end
  fcs_table[byte] = value
end

-- The count of the handsets' check is 16 bits of bits: of 8,192 bytes and more only a part is checked.
local function fcs_of(tvb, size)
  local value = 0xFFFF
  local bytes = tvb:raw(0, size % 8192)
  for i = 1, #bytes do
    value = bit.bxor(bit.rshift(value, 8), fcs_table[bit.band(bit.bxor(value, bytes:byte(i)), 0xFF)])
  end
  return bit.bxor(value, 0xFFFF)
end

local function direction_of(pinfo)
  if pinfo.p2p_dir == P2P_DIR_SENT then return "sent" end
  if pinfo.p2p_dir == P2P_DIR_RECV then return "received" end
  return "unknown"
end

local function show_direction(pinfo, direction)
  if direction == "sent" then
    pinfo.cols.src, pinfo.cols.dst = "PC", "handset"
  else
    pinfo.cols.src, pinfo.cols.dst = "handset", "PC"
  end
end

local function read_refusal(reader, code, pinfo)
  local what = reader:number("u8", f.refused)
  reader.tree:add(f.refusal, reader.tvb(0, 1), commands[code]):set_generated()
  reader.tree:add_proto_expert_info(refused, commands[code])
  if not what then return "Refused: " .. commands[code] end
  -- The request, once more.
  local size = reader.size - 1
  local inner = Reader.new(reader.tvb(1, size):tvb(), size, reader.tree:add(kral, "Refused request"))
  inner.at = 1
  local read = readers[what]
  local name = read and read(inner, what, false) or commands[what] or ("Command " .. what)
  reader.at = reader.size
  return "Refused: " .. commands[code] .. " (" .. name .. ")"
end

function kral.dissector(tvb, pinfo, tree)
  pinfo.cols.protocol = "KRAL"
  local direction = direction_of(pinfo)
  show_direction(pinfo, direction)
  local length = tvb:len()
  local top = tree:add(kral, tvb())
  top:add(f.direction, direction):set_generated()
  if length < 3 then
    pinfo.cols.info = "Too short"
    if length > 0 then top:add(f.payload, tvb()) end
    top:add_proto_expert_info(cut)
    return length
  end

  local size = length - 2
  local good = fcs_of(tvb, size) == tvb(size, 2):le_uint()
  local code = tvb(0, 1):uint()
  local is_reply = direction ~= "sent"
  local reader = Reader.new(tvb, size, top)
  reader:number("u8", f.code)
  local protocol = good and protocol_of(tvb, size, pinfo, is_reply, code) or "diagnostics"
  local read = readers[code]
  local name
  if protocol ~= "diagnostics" then
    top:add(f.protocol, protocol):set_generated()
    name = download_readers[protocol](reader, code, is_reply)
  elseif defined.diag[code] and not (refusals[code] and is_reply) then
    name = show_defined(reader, defined.diag[code], is_reply)
  elseif refusals[code] and is_reply then
    name = read_refusal(reader, code, pinfo)
  else
    name = read and read(reader, code, is_reply) or commands[code] or ("Command " .. code)
  end
  if reader.at < size then reader:rest(f.payload) end
  top:add(f.command, tvb(0, 1), name):set_generated()
  top:add_le(f.fcs, tvb(size, 2))
  top:add(f.fcs_good, tvb(size, 2), good):set_generated()
  if good and not (protocol == "diagnostics" and unasked[code]) then
    add_pair(pair(tvb, size, pinfo, is_reply, code, protocol), pinfo, top)
  end
  if not good then
    top:add_proto_expert_info(bad_fcs)
    name = name .. " (bad FCS)"
  end
  pinfo.cols.info = name
  top:append_text(": " .. name)
  return length
end

-- Packets of the boot loader's tell their own length. The library reads command and length first, and then the rest:
-- of such a packet there are two runs of bytes.

local function boot_part(tvb, pinfo, direction)
  if pinfo.visited then return boot_bodies[pinfo.number] end
  local awaited = boot_awaited
  boot_awaited = nil
  if awaited and direction == awaited.direction and tvb:len() == awaited.size then
    boot_bodies[pinfo.number] = awaited.command
    return awaited.command
  end
  if tvb:len() == 8 and tvb(4, 4):le_uint() > 8 and tvb(4, 4):le_uint() <= 128 then
    boot_awaited = { command = tvb(0, 4):le_uint(), size = tvb(4, 4):le_uint() - 8, direction = direction }
  end
end

local function read_boot(tvb, tree, pinfo, direction)
  local command = boot_part(tvb, pinfo, direction)
  local reader = Reader.new(tvb, tvb:len(), tree)
  if not command then
    if tvb:len() < 8 then return nil end
    command = tvb(0, 4):le_uint()
    local length = tvb(4, 4):le_uint()
    if not boot_commands[command] or (length ~= tvb:len() and (tvb:len() ~= 8 or length > 128)) then return nil end
    reader:number("u32", f.boot_command)
    reader:number("u32", f.boot_length)
  end
  local known = boot_commands[command]
  if not known then return nil end
  local info = known[1]
  for _, name in ipairs(known[2]) do
    local value = reader:has(4) and reader:number("u32", f["boot_" .. name])
    if name == "status" and value and value ~= 0 then info = info .. ", status " .. value end
  end
  tree:add(f.command, tvb(), info):set_generated()
  return info
end

function kral_bytes.dissector(tvb, pinfo, tree)
  pinfo.cols.protocol = "KRAL bytes"
  show_direction(pinfo, direction_of(pinfo))
  local top = tree:add(kral_bytes, tvb())
  top:add(f.direction, direction_of(pinfo)):set_generated()
  if tvb:len() > 0 then top:add(f.noise, tvb()) end
  pinfo.cols.info = read_boot(tvb, top, pinfo, direction_of(pinfo)) or (tvb:len() .. " bytes without a frame")
  return tvb:len()
end

DissectorTable.get("wtap_encap"):add(wtap.USER0, kral)
DissectorTable.get("wtap_encap"):add(wtap.USER1, kral_bytes)
