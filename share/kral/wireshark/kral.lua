-- The dissector of kral's traces (pcapng files with the link types USER0 and USER1): commands and answers of a
-- handset, what it sends unasked, refusals, and which answer belongs to which request.
--
--   tshark -X lua_script:kral.lua -r trace.pcapng -V
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
}
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
kral.experts = { bad_fcs, cut, refused }

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

local function read_ftm(reader, head)
  local mode = head == 75 and reader:number("u16", f.ftm_mode) or nil
  local command = reader:number("u16", f.ftm_command)
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

local function read_subsystem(reader, is_reply)
  local subsystem = reader:number("u8", f.subsystem)
  if not subsystem then return "Subsystem" end
  if subsystem == FTM then return read_ftm(reader, 75) end
  local command = reader:number("u16", f.subsystem_command)
  local name = subsystems[subsystem] or ("Subsystem " .. subsystem)
  if not command then return name end
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
  [59] = function(reader)
    reader.at = 5
    return read_ftm(reader, 59)
  end,
  [75] = function(reader, _, is_reply) return read_subsystem(reader, is_reply) end,
  [128] = function(reader, _, is_reply) return read_subsystem(reader, is_reply) end,
  [115] = function(reader)
    reader.at = 4
    local operation = reader:number("u32", f.log_operation)
    return commands[115] .. (operation and (": " .. (log_operations[operation] or operation)) or "")
  end,
}
for code = 2, 7 do readers[code] = read_memory end

-- --- Which answer belongs to which request ------------------------------------------------------------------------

local requests = {} -- those without an answer so far, by what an answer repeats of them; of each the last one
local pairs_of = {} -- by the number of either packet
local function forget()
  requests, pairs_of = {}, {}
end
kral.init = forget

-- What an answer repeats of its request: the code, and below 75 and 128 subsystem and command.
local function key_of(tvb, at, size)
  if size < 1 then return nil end
  local code = tvb(at, 1):uint()
  local more = (code == 75 or code == 128) and math.min(size - 1, 3) or 0
  return tvb(at, 1 + more):bytes():tohex()
end

local function pair(tvb, size, pinfo, is_reply, code)
  if pinfo.visited then return pairs_of[pinfo.number] end
  if not is_reply then
    local key = key_of(tvb, 0, size)
    if key then requests[key] = { number = pinfo.number, time = pinfo.rel_ts } end
    return nil
  end
  local at = refusals[code] and 1 or 0 -- a refusal has the request behind its code
  local key = key_of(tvb, at, size - at)
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
  local read = readers[code]
  local name
  if refusals[code] and is_reply then
    name = read_refusal(reader, code, pinfo)
  else
    name = read and read(reader, code, is_reply) or commands[code] or ("Command " .. code)
  end
  if reader.at < size then reader:rest(f.payload) end
  top:add(f.command, tvb(0, 1), name):set_generated()
  top:add_le(f.fcs, tvb(size, 2))
  top:add(f.fcs_good, tvb(size, 2), good):set_generated()
  if good and not unasked[code] then add_pair(pair(tvb, size, pinfo, is_reply, code), pinfo, top) end
  if not good then
    top:add_proto_expert_info(bad_fcs)
    name = name .. " (bad FCS)"
  end
  pinfo.cols.info = name
  top:append_text(": " .. name)
  return length
end

function kral_bytes.dissector(tvb, pinfo, tree)
  pinfo.cols.protocol = "KRAL bytes"
  show_direction(pinfo, direction_of(pinfo))
  local top = tree:add(kral_bytes, tvb())
  top:add(f.direction, direction_of(pinfo)):set_generated()
  if tvb:len() > 0 then top:add(f.noise, tvb()) end
  pinfo.cols.info = tvb:len() .. " bytes without a frame"
  return tvb:len()
end

DissectorTable.get("wtap_encap"):add(wtap.USER0, kral)
DissectorTable.get("wtap_encap"):add(wtap.USER1, kral_bytes)
