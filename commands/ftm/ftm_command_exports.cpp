// Exports of the RF commands whose payload is the caller's: each names its row of the command table.
#include "commands/ftm/ftm_command.h"
#include "commands/ftm/ftm_command_table.h"
#include "kral/ftm_commands.h"

using kral::ftm::CommandNamed;
using kral::ftm::ExportedCommand;

extern "C" {

uint8_t KRAL_CALL KRAL_FTM_GSM_CAPTURE_IQ(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GSM_CAPTURE_IQ"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_SYNTH_STATE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_SYNTH_STATE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_SMPS_PA_BIAS_VAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_SMPS_PA_BIAS_VAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_SMPS_PA_BIAS_OVERRIDE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_SMPS_PA_BIAS_OVERRIDE"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_CDMA_CW_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("CDMA_CW_WAVEFORM"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_RX_AGC(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                      uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_RX_AGC"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_PA_RANGE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                        uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_PA_RANGE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_LNA_RANGE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                         uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_LNA_RANGE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_ADC_VAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                       uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_ADC_VAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_LNA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_LNA_OFFSET"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_DVGA_OFFSET"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_CDMA_IM2(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                        uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_CDMA_IM2"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_FREQ_SENSE_GAIN(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                               uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_FREQ_SENSE_GAIN"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                        uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("TX_SWEEP_CAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_DVGA_OFFSET"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_LNA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_LNA_OFFSET"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_HDET_FROM_TX_SWEEP_CAL"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_FM_IQ(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                     uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_FM_IQ"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_CTON(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                    uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_CTON"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_HDET_TRACKING(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_HDET_TRACKING"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_CONFIGURE_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("CONFIGURE_TX_SWEEP_CAL"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_LTE_CONFIGURE_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("LTE_CONFIGURE_TX_SWEEP_CAL"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_CDMA_IM2_WITH_SUPPRESSSION(KRAL_HANDLE handle, const uint8_t* payload,
                                                          uint16_t payload_size, uint8_t* response,
                                                          uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_CDMA_IM2_WITH_SUPPRESSSION"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_ALL_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                          uint16_t payload_size, uint8_t* response,
                                                          uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_ALL_HDET_FROM_TX_SWEEP_CAL"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_LTE_GET_ALL_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                              uint16_t payload_size, uint8_t* response,
                                                              uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("LTE_GET_ALL_HDET_FROM_TX_SWEEP_CAL"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_RF_POWER_MODE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_RF_POWER_MODE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_SWEEP_STEP_SIZE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TX_SWEEP_STEP_SIZE"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_DO_DC_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                     uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("DO_DC_CAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TX_WAVEFORM"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_DO_IQ_MISMATCH_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("DO_IQ_MISMATCH_CAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_ALL_HDET_FROM_TX_SWEEP_CAL_V2(KRAL_HANDLE handle, const uint8_t* payload,
                                                             uint16_t payload_size, uint8_t* response,
                                                             uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_ALL_HDET_FROM_TX_SWEEP_CAL_V2"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_BLOCK_MASK(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_BLOCK_MASK"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ENABLE_LPM_HDET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ENABLE_LPM_HDET"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_LPM_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                          uint16_t payload_size, uint8_t* response,
                                                          uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_LPM_HDET_FROM_TX_SWEEP_CAL"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_ALL_LPM_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                              uint16_t payload_size, uint8_t* response,
                                                              uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_ALL_LPM_HDET_FROM_TX_SWEEP_CAL"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_CONFIG_EUL_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                               uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("CONFIG_EUL_WAVEFORM"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_DISABLE_EUL_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("DISABLE_EUL_WAVEFORM"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_WCDMA_SET_TXAGC(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("WCDMA_SET_TXAGC"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_WCDMA_TXAGC_SWEEP(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("WCDMA_TXAGC_SWEEP"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SWITCH_TX_ANT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                         uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SWITCH_TX_ANT"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_POWER_DBM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TX_POWER_DBM"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_LTE_SET_NET_SIG_VALUE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("LTE_SET_NET_SIG_VALUE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_RX_LEVEL_DBM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_RX_LEVEL_DBM"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_OFFSET_CW(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                         uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_OFFSET_CW"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_PA_STATE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                        uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_PA_STATE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_LTE_SET_LNA_STATE_DBM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("LTE_SET_LNA_STATE_DBM"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_FREQ_ADJUST(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_FREQ_ADJUST"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_MULTIPLE_RX_LEVEL_DBM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_MULTIPLE_RX_LEVEL_DBM"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_LTE_SET_TDD_PARAMS(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("LTE_SET_TDD_PARAMS"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_PA_PROFILE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_PA_PROFILE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TRANSMIT_CONT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TRANSMIT_CONT"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TRANSMIT_BURST(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TRANSMIT_BURST"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_RX_BURST(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                        uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_RX_BURST"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_POWER_LEVEL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TX_POWER_LEVEL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_RSSI(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                    uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_RSSI"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_PA_START_DELTA(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_PA_START_DELTA"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_PA_STOP_DELTA(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_PA_STOP_DELTA"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_PA_DAC_INPUT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_PA_DAC_INPUT"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_RX_CONTINUOUS(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_RX_CONTINUOUS"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_CAL_SWEEP(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TX_CAL_SWEEP"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_DO_GSM_AUTOCAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("DO_GSM_AUTOCAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_AMAM_TABLE_DC(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_AMAM_TABLE_DC"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_FRAME_MATRIX(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                               uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TX_FRAME_MATRIX"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ENABLE_POLAR_REF_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ENABLE_POLAR_REF_CAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TWOTONE_FREQ_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TWOTONE_FREQ_OFFSET"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_DO_CALPATH_RSB(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("DO_CALPATH_RSB"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_OPLL_BW(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                       uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_OPLL_BW"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_BASEBAND_BW_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("BASEBAND_BW_CAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GSM_DO_TX_KV_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GSM_DO_TX_KV_CAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_DA_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size, uint8_t* response,
                                  uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("DA_CAL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_RSSI_CAL_POINT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_GET_RSSI_CAL_POINT"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_RX_RSSI(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_GET_RX_RSSI"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_AGC_STATE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_GET_AGC_STATE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_WRITE_CAL_DATA(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                               uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_WRITE_CAL_DATA"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_LNA_SELECT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_LNA_SELECT"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_RF_SWITCH_CONFIG(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_RF_SWITCH_CONFIG"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_SYNTH_LOCK(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_SYNTH_LOCK"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_SET_GAIN_STATE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                               uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_SET_GAIN_STATE"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_TUNE_PLL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                         uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_TUNE_PLL"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_IM2(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                        uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("ZEFT_GET_IM2"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_CAGC_DUAL_CARRIER_RX_AGC(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_CAGC_DUAL_CARRIER_RX_AGC"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_DUAL_CARRIER_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_DUAL_CARRIER_DVGA_OFFSET"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GET_DUAL_CARRIER_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GET_DUAL_CARRIER_DVGA_OFFSET"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_MULTI_CHAN(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                          uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_MULTI_CHAN"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_MULTI_CHAN_ENH(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_MULTI_CHAN_ENH"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_IQ_LOGGING(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("TDSCDMA_IQ_LOGGING"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_SET_BURST_TX_PARAMS(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("TDSCDMA_SET_BURST_TX_PARAMS"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_BURST_TX(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("TDSCDMA_BURST_TX"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_BURST_RX(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                            uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("TDSCDMA_BURST_RX"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_SWITCH_TX_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("TDSCDMA_SWITCH_TX_WAVEFORM"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TUNER_PROGRAM_SCENARIO(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TUNER_PROGRAM_SCENARIO"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TUNER_SCENARIO_OVERRIDE(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TUNER_SCENARIO_OVERRIDE"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TUNER_TUNE_CODE_OVERRIDE(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("SET_TUNER_TUNE_CODE_OVERRIDE"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_GSM_V4_CAL_EXECUTE_SWEEP(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("GSM_V4_CAL_EXECUTE_SWEEP"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_IQ_CAPTURE_ACQUIRE_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("IQ_CAPTURE_ACQUIRE_SAMPLES"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_IQ_CAPTURE_GET_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("IQ_CAPTURE_GET_SAMPLES"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_IQ_CAPTURE_ANALYZE_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("IQ_CAPTURE_ANALYZE_SAMPLES"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_RF_MEAS_TX_PARAMS(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("RF_MEAS_TX_PARAMS"), payload, payload_size, response, response_size);
}

uint8_t KRAL_CALL KRAL_FTM_FBRX_IQ_CAPTURE_TRIGGER(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("FBRX_IQ_CAPTURE_TRIGGER"), payload, payload_size, response,
                         response_size);
}

uint8_t KRAL_CALL KRAL_FTM_FBRX_IQ_CAPTURE_GET_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size) {
  return ExportedCommand(handle, CommandNamed("FBRX_IQ_CAPTURE_GET_SAMPLES"), payload, payload_size, response,
                         response_size);
}

}  // extern "C"
