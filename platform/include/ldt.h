/*
 * The platform's connectivity test library (libldt). Every operation returns 0 for success, anything else is
 * a failure. Units of power, rate and channel are the library's own; the station sends them as they are to be
 * used.
 */
#pragma once

#include <stdint.h>

/* What the operations below are told to do. */
constexpr int32_t LDT_STOP = 0;
constexpr int32_t LDT_START = 1;
constexpr int32_t LDT_GPS_READ_SIGNAL = 2;

extern "C" {
/* Bluetooth chip: on = 1 switches it on for testing, 0 off. */
int32_t ldt_btCtrl(int32_t on);
/* Bluetooth hardware check. */
int32_t ldt_btCheck(void);

/* Wi-Fi chip: on = 1 puts it into test mode, 0 takes it out again. */
int32_t ldt_wifiCtrl(int32_t on);
/* Wi-Fi connectivity check. */
int32_t ldt_wifiCheck(void);

/* Continuous Wi-Fi transmission: (1, power, rate, channel) starts, (0, 0, 0, 0) stops. */
int32_t ldt_TxTest(int32_t on, int32_t power, int32_t rate, int32_t channel);

/*
 * Wi-Fi reception: (1, channel, rate, null) starts; (0, channel of the start, 0, count) stops and stores the
 * number of packets received. The caller owns count_out.
 */
int32_t ldt_RxTest(int32_t on, int32_t channel, int32_t rate, int32_t *count_out);

/*
 * GPS: (1, 0, null, null) starts, (0, 0, null, null) stops, (2, index, svid, cnr) reads the signal of the
 * satellite at index: its id and its carrier-to-noise value. The caller owns both outputs.
 */
int32_t ldt_gpsCtrl(int32_t operation, int32_t index, int32_t *svid_out, int32_t *cnr_out);
/* GPS connectivity check. */
int32_t ldt_gpsCheck(void);
}
