/**
 * @file band.h
 * Channel numbers to carrier frequencies.
 *
 * Band ids: 0-4 GSM (0 E-GSM, 1 P-GSM, 2 DCS 1800, 3 PCS 1900, 4 GSM 850); 100-110 and 118 WCDMA bands I-XI and XIX;
 * 200-215 CDMA band classes 0-15; 300 a 2.4 GHz channel plan; 400-403, 600-611 and 800-801 broadcast-receive bands;
 * 700 the satellite navigation carrier; 900-930 LTE bands 1-31; 932-940 LTE bands 33-41; 1000-1010 TD-SCDMA bands.
 * Not every id in a group has channels; KRAL_Band_Helper_GetBand lists those that have.
 *
 * These functions are arithmetic: no handle, no handset, no log line, no waiting; any thread, at any time.
 */
#ifndef KRAL_BAND_H
#define KRAL_BAND_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/**
 * The uplink carrier of a channel.
 *
 * @param band     a band id
 * @param channel  an uplink channel number of the band; CDMA and GSM numbers name a channel pair
 * @return MHz; 0.0 when the channel is not in the band's uplink list, and for bands that only receive
 */
KRAL_API double KRAL_CALL KRAL_Band_Helper_CalculateULFrequency(uint16_t band, int32_t channel);

/**
 * The downlink carrier of a channel. In WCDMA and LTE, uplink and downlink have numbers of their own, and this call
 * reads the number as a downlink channel.
 *
 * @param band     a band id
 * @param channel  a downlink channel number of the band
 * @return MHz; 0.0 when the channel is not in the band's downlink list, and for bands without a downlink rule
 *         (202, 207, 208, 209)
 */
KRAL_API double KRAL_CALL KRAL_Band_Helper_CalculateDLFrequency(uint16_t band, int32_t channel);

/* --- Additions: the bands and their channels, for listing ------------------------------------------------------- */

/** The channel lists of a band: `direction` of KRAL_Band_Helper_GetBandRange. */
enum {
  KRAL_BAND_ANY_DIRECTION = 0, /* all numbers in use in the band, some without a frequency rule */
  KRAL_BAND_UPLINK = 1,
  KRAL_BAND_DOWNLINK = 2
};

/** @return the number of bands that have channels */
KRAL_API uint32_t KRAL_CALL KRAL_Band_Helper_GetBandCount(void);

/**
 * One band of the list, in rising order of the ids.
 *
 * @param      index  0 to count - 1
 * @param[out] band   the band id
 * @return 1; 0 for an index past the list or a null output
 */
KRAL_API uint8_t KRAL_CALL KRAL_Band_Helper_GetBand(uint32_t index, uint16_t* band);

/**
 * The name of a band, such as "LTE band 4".
 *
 * @param      band  a band id
 * @param[out] name  [size] receives the text, cut to fit and always terminated
 * @param      size  bytes in `name`; 40 hold every name
 * @return 1; 0 for a band without channels, a null output or size 0
 */
KRAL_API uint8_t KRAL_CALL KRAL_Band_Helper_GetBandName(uint16_t band, char* name, uint32_t size);

/**
 * One inclusive range of a band's channel numbers.
 *
 * @param      band       a band id
 * @param      direction  KRAL_BAND_ANY_DIRECTION, KRAL_BAND_UPLINK or KRAL_BAND_DOWNLINK
 * @param      index      0 for the first range; a list has at most 5
 * @param[out] first      first channel number
 * @param[out] last       last channel number
 * @return 1; 0 when there is no such range (or band, or direction) and for a null output
 */
KRAL_API uint8_t KRAL_CALL KRAL_Band_Helper_GetBandRange(uint16_t band, uint8_t direction, uint32_t index,
                                                         int32_t* first, int32_t* last);

#ifdef __cplusplus
}
#endif

#endif
