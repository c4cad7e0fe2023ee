// The RF commands that go out with the current mode id: id, name and which mode takes it.
#ifndef KRAL_COMMANDS_FTM_FTM_COMMAND_TABLE_H
#define KRAL_COMMANDS_FTM_FTM_COMMAND_TABLE_H

#include <algorithm>
#include <array>
#include <cstdint>
#include <string_view>

namespace kral::ftm {

// Which dispatcher of the handset receives a command.
enum class ModeRule : uint8_t {
  kCurrent,  // the one chosen by KRAL_FTM_SET_MODE_ID or KRAL_FTM_SET_MODE
  kByGroup,  // the current one, replaced first when it does not belong to the RF mode's group
};

struct Command {
  uint16_t id;
  std::string_view name;  // behind "KRAL_FTM_"
  ModeRule mode_rule = ModeRule::kCurrent;
};

// Sorted by id. A few ids serve two names: the technology decides what the handset makes of them.
inline constexpr std::array kCommands = {
    Command{2, "SET_TX_ON"},
    Command{3, "SET_TX_OFF"},
    Command{7, "SET_MODE", ModeRule::kByGroup},
    Command{8, "SET_CHAN"},
    Command{11, "GSM_CAPTURE_IQ"},
    Command{16, "GET_SYNTH_STATE"},
    Command{17, "SET_SMPS_PA_BIAS_VAL"},
    Command{18, "SET_SMPS_PA_BIAS_OVERRIDE"},
    Command{50, "CDMA_CW_WAVEFORM"},
    Command{53, "GET_RX_AGC"},
    Command{54, "SET_PA_RANGE"},
    Command{58, "SET_LNA_RANGE"},
    Command{59, "GET_ADC_VAL"},
    Command{81, "SET_LNA_OFFSET"},
    Command{111, "SET_DVGA_OFFSET"},
    Command{114, "GET_CDMA_IM2"},
    Command{115, "SET_FREQ_SENSE_GAIN"},
    Command{116, "TX_SWEEP_CAL"},
    Command{117, "GET_DVGA_OFFSET"},
    Command{118, "GET_LNA_OFFSET"},
    Command{119, "GET_HDET_FROM_TX_SWEEP_CAL"},
    Command{120, "GET_FM_IQ"},
    Command{122, "GET_CTON"},
    Command{124, "SET_HDET_TRACKING"},
    Command{125, "CONFIGURE_TX_SWEEP_CAL"},
    Command{125, "LTE_CONFIGURE_TX_SWEEP_CAL"},
    Command{126, "GET_CDMA_IM2_WITH_SUPPRESSSION"},
    Command{127, "GET_ALL_HDET_FROM_TX_SWEEP_CAL"},
    Command{127, "LTE_GET_ALL_HDET_FROM_TX_SWEEP_CAL"},
    Command{128, "SET_RF_POWER_MODE"},
    Command{129, "SET_TX_SWEEP_STEP_SIZE"},
    Command{133, "DO_DC_CAL"},
    Command{136, "SET_TX_WAVEFORM"},
    Command{143, "DO_IQ_MISMATCH_CAL"},
    Command{144, "GET_ALL_HDET_FROM_TX_SWEEP_CAL_V2"},
    Command{153, "SET_BLOCK_MASK"},
    Command{161, "ENABLE_LPM_HDET"},
    Command{162, "GET_LPM_HDET_FROM_TX_SWEEP_CAL"},
    Command{163, "GET_ALL_LPM_HDET_FROM_TX_SWEEP_CAL"},
    Command{170, "CONFIG_EUL_WAVEFORM"},
    Command{172, "DISABLE_EUL_WAVEFORM"},
    Command{173, "WCDMA_SET_TXAGC"},
    Command{174, "WCDMA_TXAGC_SWEEP"},
    Command{175, "SWITCH_TX_ANT"},
    Command{176, "SET_TX_POWER_DBM"},
    Command{177, "LTE_SET_NET_SIG_VALUE"},
    Command{179, "GET_RX_LEVEL_DBM"},
    Command{180, "SET_OFFSET_CW"},
    Command{182, "SET_PA_STATE"},
    Command{185, "LTE_SET_LNA_STATE_DBM"},
    Command{186, "SET_FREQ_ADJUST"},
    Command{187, "GET_MULTIPLE_RX_LEVEL_DBM"},
    Command{187, "LTE_SET_TDD_PARAMS"},
    Command{212, "SET_PA_PROFILE"},
    Command{216, "SET_TRANSMIT_CONT"},
    Command{217, "SET_TRANSMIT_BURST"},
    Command{225, "SET_RX_BURST"},
    Command{227, "SET_TX_POWER_LEVEL"},
    Command{230, "GET_RSSI"},
    Command{231, "SET_PA_START_DELTA"},
    Command{232, "SET_PA_STOP_DELTA"},
    Command{233, "SET_PA_DAC_INPUT"},
    Command{234, "SET_RX_CONTINUOUS"},
    Command{235, "SET_TX_CAL_SWEEP"},
    Command{236, "DO_GSM_AUTOCAL"},
    Command{239, "SET_AMAM_TABLE_DC"},
    Command{240, "SET_TX_FRAME_MATRIX"},
    Command{241, "ENABLE_POLAR_REF_CAL"},
    Command{242, "SET_TWOTONE_FREQ_OFFSET"},
    Command{243, "DO_CALPATH_RSB"},
    Command{245, "SET_OPLL_BW"},
    Command{250, "BASEBAND_BW_CAL"},
    Command{251, "GSM_DO_TX_KV_CAL"},
    Command{310, "DA_CAL"},
    Command{400, "ZEFT_GET_RSSI_CAL_POINT"},
    Command{401, "ZEFT_GET_RX_RSSI"},
    Command{402, "ZEFT_GET_AGC_STATE"},
    Command{403, "ZEFT_WRITE_CAL_DATA"},
    Command{406, "ZEFT_LNA_SELECT"},
    Command{407, "ZEFT_RF_SWITCH_CONFIG"},
    Command{408, "ZEFT_SYNTH_LOCK"},
    Command{411, "ZEFT_SET_GAIN_STATE"},
    Command{413, "ZEFT_TUNE_PLL"},
    Command{415, "ZEFT_GET_IM2"},
    Command{600, "GET_CAGC_DUAL_CARRIER_RX_AGC"},
    Command{601, "SET_DUAL_CARRIER_DVGA_OFFSET"},
    Command{602, "GET_DUAL_CARRIER_DVGA_OFFSET"},
    Command{603, "SET_MULTI_CHAN"},
    Command{603, "SET_MULTI_CHAN_ENH"},
    Command{703, "TDSCDMA_IQ_LOGGING"},
    Command{712, "TDSCDMA_SET_BURST_TX_PARAMS"},
    Command{713, "TDSCDMA_BURST_TX"},
    Command{714, "TDSCDMA_BURST_RX"},
    Command{715, "TDSCDMA_SWITCH_TX_WAVEFORM"},
    Command{849, "SET_TUNER_PROGRAM_SCENARIO"},
    Command{850, "SET_TUNER_SCENARIO_OVERRIDE"},
    Command{861, "SET_TUNER_TUNE_CODE_OVERRIDE"},
    Command{865, "GSM_V4_CAL_EXECUTE_SWEEP"},
    Command{901, "IQ_CAPTURE_ACQUIRE_SAMPLES"},
    Command{902, "IQ_CAPTURE_GET_SAMPLES"},
    Command{903, "IQ_CAPTURE_ANALYZE_SAMPLES"},
    Command{911, "RF_MEAS_TX_PARAMS"},
    Command{913, "FBRX_IQ_CAPTURE_TRIGGER"},
    Command{914, "FBRX_IQ_CAPTURE_GET_SAMPLES"},
};
static_assert(kCommands.size() == 104);
static_assert(std::ranges::is_sorted(kCommands, {}, &Command::id));

// The row of a name; a name that is not in the table does not compile.
consteval const Command& CommandNamed(std::string_view name) {
  for (const Command& command : kCommands) {
    if (command.name == name) return command;
  }
  throw "no such FTM command";
}

}  // namespace kral::ftm

#endif
