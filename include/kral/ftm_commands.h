/**
 * @file ftm_commands.h
 * The RF commands of factory test mode whose payload the caller gives.
 *
 * They share one shape:
 *
 *     uint8_t f(KRAL_HANDLE handle, const uint8_t *payload, uint16_t payload_size,
 *               uint8_t *response, uint16_t *response_size);
 *
 * @param          handle         from a connect function
 * @param          payload        [payload_size] fields after the command id, little-endian, as the handset's software
 * defines them; may be null when payload_size is 0
 * @param          payload_size   0 to 6,137 bytes (6,136 under command code 59). A longer payload does not fit the
 *                                request: the command goes out without it, and the text log says so
 * @param[out]     response       [response_size] what the handset sent after the command id
 * @param[in,out]  response_size  in: room of `response`, at least 1 byte; out: bytes written, at most the room
 * @return 1 when the handset answered; the status words within the answer are the caller's to judge. 0 without traffic
 *         for a null payload with a size, a null response and a room of 0.
 *
 * The command goes to the dispatcher of the current mode id (KRAL_FTM_SET_MODE_ID, KRAL_FTM_SET_MODE), under the
 * command code in force (KRAL_FTM_SET_COMMAND_CODE). Any thread may call. Wait: time-out 0 (4,000 ms).
 */
#ifndef KRAL_FTM_COMMANDS_H
#define KRAL_FTM_COMMANDS_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Command 11. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GSM_CAPTURE_IQ(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 16. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_SYNTH_STATE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 17. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_SMPS_PA_BIAS_VAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                         uint16_t payload_size, uint8_t* response,
                                                         uint16_t* response_size);

/** Command 18. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_SMPS_PA_BIAS_OVERRIDE(KRAL_HANDLE handle, const uint8_t* payload,
                                                              uint16_t payload_size, uint8_t* response,
                                                              uint16_t* response_size);

/** Command 50. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_CDMA_CW_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 53. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_RX_AGC(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                               uint8_t* response, uint16_t* response_size);

/** Command 54. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_PA_RANGE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size);

/** Command 58. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_LNA_RANGE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size);

/** Command 59. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_ADC_VAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                uint8_t* response, uint16_t* response_size);

/** Command 81. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_LNA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 111. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 114. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_CDMA_IM2(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size);

/** Command 115. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_FREQ_SENSE_GAIN(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size);

/** Command 116. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size);

/** Command 117. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 118. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_LNA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 119. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                               uint16_t payload_size, uint8_t* response,
                                                               uint16_t* response_size);

/** Command 120. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_FM_IQ(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size);

/** Command 122. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_CTON(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size);

/** Command 124. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_HDET_TRACKING(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 125. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_CONFIGURE_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                           uint16_t payload_size, uint8_t* response,
                                                           uint16_t* response_size);

/** Command 125. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_LTE_CONFIGURE_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                               uint16_t payload_size, uint8_t* response,
                                                               uint16_t* response_size);

/** Command 126. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_CDMA_IM2_WITH_SUPPRESSSION(KRAL_HANDLE handle, const uint8_t* payload,
                                                                   uint16_t payload_size, uint8_t* response,
                                                                   uint16_t* response_size);

/** Command 127. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_ALL_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                                   uint16_t payload_size, uint8_t* response,
                                                                   uint16_t* response_size);

/** Command 127. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_LTE_GET_ALL_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                                       uint16_t payload_size, uint8_t* response,
                                                                       uint16_t* response_size);

/** Command 128. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_RF_POWER_MODE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 129. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_SWEEP_STEP_SIZE(KRAL_HANDLE handle, const uint8_t* payload,
                                                           uint16_t payload_size, uint8_t* response,
                                                           uint16_t* response_size);

/** Command 133. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_DO_DC_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                              uint8_t* response, uint16_t* response_size);

/** Command 136. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 143. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_DO_IQ_MISMATCH_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 144. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_ALL_HDET_FROM_TX_SWEEP_CAL_V2(KRAL_HANDLE handle, const uint8_t* payload,
                                                                      uint16_t payload_size, uint8_t* response,
                                                                      uint16_t* response_size);

/** Command 153. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_BLOCK_MASK(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 161. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ENABLE_LPM_HDET(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 162. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_LPM_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                                   uint16_t payload_size, uint8_t* response,
                                                                   uint16_t* response_size);

/** Command 163. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_ALL_LPM_HDET_FROM_TX_SWEEP_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                                       uint16_t payload_size, uint8_t* response,
                                                                       uint16_t* response_size);

/** Command 170. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_CONFIG_EUL_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size);

/** Command 172. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_DISABLE_EUL_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload,
                                                         uint16_t payload_size, uint8_t* response,
                                                         uint16_t* response_size);

/** Command 173. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_WCDMA_SET_TXAGC(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 174. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_WCDMA_TXAGC_SWEEP(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 175. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SWITCH_TX_ANT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size);

/** Command 176. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_POWER_DBM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 177. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_LTE_SET_NET_SIG_VALUE(KRAL_HANDLE handle, const uint8_t* payload,
                                                          uint16_t payload_size, uint8_t* response,
                                                          uint16_t* response_size);

/** Command 179. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_RX_LEVEL_DBM(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 180. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_OFFSET_CW(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size);

/** Command 182. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_PA_STATE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size);

/** Command 185. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_LTE_SET_LNA_STATE_DBM(KRAL_HANDLE handle, const uint8_t* payload,
                                                          uint16_t payload_size, uint8_t* response,
                                                          uint16_t* response_size);

/** Command 186. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_FREQ_ADJUST(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 187. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_MULTIPLE_RX_LEVEL_DBM(KRAL_HANDLE handle, const uint8_t* payload,
                                                              uint16_t payload_size, uint8_t* response,
                                                              uint16_t* response_size);

/** Command 187. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_LTE_SET_TDD_PARAMS(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 212. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_PA_PROFILE(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 216. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TRANSMIT_CONT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 217. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TRANSMIT_BURST(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 225. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_RX_BURST(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size);

/** Command 227. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_POWER_LEVEL(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 230. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_RSSI(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                             uint8_t* response, uint16_t* response_size);

/** Command 231. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_PA_START_DELTA(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 232. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_PA_STOP_DELTA(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 233. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_PA_DAC_INPUT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 234. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_RX_CONTINUOUS(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 235. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_CAL_SWEEP(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 236. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_DO_GSM_AUTOCAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 239. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_AMAM_TABLE_DC(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 240. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_FRAME_MATRIX(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size);

/** Command 241. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ENABLE_POLAR_REF_CAL(KRAL_HANDLE handle, const uint8_t* payload,
                                                         uint16_t payload_size, uint8_t* response,
                                                         uint16_t* response_size);

/** Command 242. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TWOTONE_FREQ_OFFSET(KRAL_HANDLE handle, const uint8_t* payload,
                                                            uint16_t payload_size, uint8_t* response,
                                                            uint16_t* response_size);

/** Command 243. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_DO_CALPATH_RSB(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 245. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_OPLL_BW(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                uint8_t* response, uint16_t* response_size);

/** Command 250. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_BASEBAND_BW_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 251. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GSM_DO_TX_KV_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 310. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_DA_CAL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                           uint8_t* response, uint16_t* response_size);

/** Command 400. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_RSSI_CAL_POINT(KRAL_HANDLE handle, const uint8_t* payload,
                                                            uint16_t payload_size, uint8_t* response,
                                                            uint16_t* response_size);

/** Command 401. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_RX_RSSI(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 402. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_AGC_STATE(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 403. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_WRITE_CAL_DATA(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size);

/** Command 406. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_LNA_SELECT(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 407. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_RF_SWITCH_CONFIG(KRAL_HANDLE handle, const uint8_t* payload,
                                                          uint16_t payload_size, uint8_t* response,
                                                          uint16_t* response_size);

/** Command 408. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_SYNTH_LOCK(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                    uint8_t* response, uint16_t* response_size);

/** Command 411. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_SET_GAIN_STATE(KRAL_HANDLE handle, const uint8_t* payload,
                                                        uint16_t payload_size, uint8_t* response,
                                                        uint16_t* response_size);

/** Command 413. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_TUNE_PLL(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size);

/** Command 415. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_ZEFT_GET_IM2(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                 uint8_t* response, uint16_t* response_size);

/** Command 600. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_CAGC_DUAL_CARRIER_RX_AGC(KRAL_HANDLE handle, const uint8_t* payload,
                                                                 uint16_t payload_size, uint8_t* response,
                                                                 uint16_t* response_size);

/** Command 601. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_DUAL_CARRIER_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload,
                                                                 uint16_t payload_size, uint8_t* response,
                                                                 uint16_t* response_size);

/** Command 602. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_DUAL_CARRIER_DVGA_OFFSET(KRAL_HANDLE handle, const uint8_t* payload,
                                                                 uint16_t payload_size, uint8_t* response,
                                                                 uint16_t* response_size);

/** Command 603. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_MULTI_CHAN(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                   uint8_t* response, uint16_t* response_size);

/** Command 603. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_MULTI_CHAN_ENH(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 703. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_IQ_LOGGING(KRAL_HANDLE handle, const uint8_t* payload,
                                                       uint16_t payload_size, uint8_t* response,
                                                       uint16_t* response_size);

/** Command 712. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_SET_BURST_TX_PARAMS(KRAL_HANDLE handle, const uint8_t* payload,
                                                                uint16_t payload_size, uint8_t* response,
                                                                uint16_t* response_size);

/** Command 713. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_BURST_TX(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 714. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_BURST_RX(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                     uint8_t* response, uint16_t* response_size);

/** Command 715. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_TDSCDMA_SWITCH_TX_WAVEFORM(KRAL_HANDLE handle, const uint8_t* payload,
                                                               uint16_t payload_size, uint8_t* response,
                                                               uint16_t* response_size);

/** Command 849. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TUNER_PROGRAM_SCENARIO(KRAL_HANDLE handle, const uint8_t* payload,
                                                               uint16_t payload_size, uint8_t* response,
                                                               uint16_t* response_size);

/** Command 850. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TUNER_SCENARIO_OVERRIDE(KRAL_HANDLE handle, const uint8_t* payload,
                                                                uint16_t payload_size, uint8_t* response,
                                                                uint16_t* response_size);

/** Command 861. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TUNER_TUNE_CODE_OVERRIDE(KRAL_HANDLE handle, const uint8_t* payload,
                                                                 uint16_t payload_size, uint8_t* response,
                                                                 uint16_t* response_size);

/** Command 865. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GSM_V4_CAL_EXECUTE_SWEEP(KRAL_HANDLE handle, const uint8_t* payload,
                                                             uint16_t payload_size, uint8_t* response,
                                                             uint16_t* response_size);

/** Command 901. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_IQ_CAPTURE_ACQUIRE_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload,
                                                               uint16_t payload_size, uint8_t* response,
                                                               uint16_t* response_size);

/** Command 902. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_IQ_CAPTURE_GET_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload,
                                                           uint16_t payload_size, uint8_t* response,
                                                           uint16_t* response_size);

/** Command 903. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_IQ_CAPTURE_ANALYZE_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload,
                                                               uint16_t payload_size, uint8_t* response,
                                                               uint16_t* response_size);

/** Command 911. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_RF_MEAS_TX_PARAMS(KRAL_HANDLE handle, const uint8_t* payload, uint16_t payload_size,
                                                      uint8_t* response, uint16_t* response_size);

/** Command 913. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_FBRX_IQ_CAPTURE_TRIGGER(KRAL_HANDLE handle, const uint8_t* payload,
                                                            uint16_t payload_size, uint8_t* response,
                                                            uint16_t* response_size);

/** Command 914. */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_FBRX_IQ_CAPTURE_GET_SAMPLES(KRAL_HANDLE handle, const uint8_t* payload,
                                                                uint16_t payload_size, uint8_t* response,
                                                                uint16_t* response_size);

#ifdef __cplusplus
}
#endif

#endif
