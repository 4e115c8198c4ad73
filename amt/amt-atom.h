#pragma once

#include <stdint.h>

/*
 * The ids of the atoms that requests and responses carry, in id order, with the type of the value: those of
 * the daemon's own, and those that the modem's answers are taken apart into. Stations know them by number.
 */
constexpr uint8_t AMT_ATOM_RESULT = 1;                 /* int: 0, or the reason of a refusal */
constexpr uint8_t AMT_ATOM_DATA = 4;                   /* bytes: received data, or a table's */
constexpr uint8_t AMT_ATOM_BATTERY_VOLTAGE = 5;        /* int: in the kernel's unit */
constexpr uint8_t AMT_ATOM_RX_NUMBER = 12;             /* int: before the data of a reception */
constexpr uint8_t AMT_ATOM_IQ_POWER = 13;              /* int */
constexpr uint8_t AMT_ATOM_SWITCH = 15;                /* bool: on or off; on when it is missing */
constexpr uint8_t AMT_ATOM_VERSION = 18;               /* bytes: the text of a version */
constexpr uint8_t AMT_ATOM_MODULE = 19;                /* int: the module whose version is asked for */
constexpr uint8_t AMT_ATOM_IMEI = 21;                  /* string */
constexpr uint8_t AMT_ATOM_TEMPERATURE = 22;           /* int */
constexpr uint8_t AMT_ATOM_RF_ADC = 24;                /* int */
constexpr uint8_t AMT_ATOM_LCD_LEVEL = 26;             /* int: 0 to 255; any other restores the first level */
constexpr uint8_t AMT_ATOM_OUTDATE = 27;               /* string */
constexpr uint8_t AMT_ATOM_LOOP_TYPE = 30;             /* int: which loop the codec closes */
constexpr uint8_t AMT_ATOM_IQ_SERIAL = 34;             /* bytes */
constexpr uint8_t AMT_ATOM_VERDICT = 36;               /* int: the result of a station's test */
constexpr uint8_t AMT_ATOM_DESCRIPTION = 37;           /* string: what the station says about its verdict */
constexpr uint8_t AMT_ATOM_BOARD = 38;                 /* string: the board's serial number */
constexpr uint8_t AMT_ATOM_STATION = 39;               /* int: the number of the station */
constexpr uint8_t AMT_ATOM_SIM_CHECK = 41;             /* bool: there is a SIM */
constexpr uint8_t AMT_ATOM_GSM_DATA = 43;              /* bytes: what the GSM side answers */
constexpr uint8_t AMT_ATOM_TABLE_FLAG = 44;            /* bool: the flag of a table in the flash */
constexpr uint8_t AMT_ATOM_CARD_CAPACITY = 55;         /* int: KiB of the external memory card */
constexpr uint8_t AMT_ATOM_DSP_DATA = 62;              /* bytes: what the DSP answers or tells unasked */
constexpr uint8_t AMT_ATOM_BT_OPERATION = 110;         /* int: 1 read, 2 write, 3 check */
constexpr uint8_t AMT_ATOM_BT_ADDRESS = 111;           /* string */
constexpr uint8_t AMT_ATOM_CAMERA_CONTROL = 112;       /* int: the self-test to run, 1 or 2 */
constexpr uint8_t AMT_ATOM_CAMERA_RESULT = 113;        /* int: the driver's verdict, 3 without a camera */
constexpr uint8_t AMT_ATOM_GPS_OPERATION = 140;        /* int: 0 stop, 2 check, any other start */
constexpr uint8_t AMT_ATOM_GPS_SATELLITE = 141;        /* int: its index in a request, its id in a response */
constexpr uint8_t AMT_ATOM_GPS_CARRIER_TO_NOISE = 144; /* int */
constexpr uint8_t AMT_ATOM_ADC_CALIBRATION_A = 146; /* int, with the next three: the battery ADC's values */
constexpr uint8_t AMT_ATOM_ADC_CALIBRATION_B = 147;
constexpr uint8_t AMT_ATOM_ADC_CALIBRATION_C = 148;
constexpr uint8_t AMT_ATOM_ADC_CALIBRATION_D = 149;
constexpr uint8_t AMT_ATOM_BATTERY_ADC = 151;       /* int: the battery ADC's raw value */
constexpr uint8_t AMT_ATOM_WIFI_OPERATION = 152;    /* int: 0 read, 1 write, 2 check */
constexpr uint8_t AMT_ATOM_WIFI_ADDRESS = 153;      /* string */
constexpr uint8_t AMT_ATOM_WIFI_SUB_COMMAND = 154;  /* 1 byte: a step of the radio test, 1 to 6 */
constexpr uint8_t AMT_ATOM_WIFI_CHANNEL = 155;      /* 1 byte */
constexpr uint8_t AMT_ATOM_WIFI_RATE = 156;         /* 2 bytes */
constexpr uint8_t AMT_ATOM_WIFI_POWER = 157;        /* 2 bytes */
constexpr uint8_t AMT_ATOM_WIFI_PACKET_COUNT = 158; /* int: what a reception counted */
constexpr uint8_t AMT_ATOM_MODEM_CHANNEL = 159;     /* int: the modem channel of later AT commands */
constexpr uint8_t AMT_ATOM_ADB_OPERATION = 160;     /* int: 0 read, 1 write */
constexpr uint8_t AMT_ATOM_ADB_SERIAL = 161;        /* string */
constexpr uint8_t AMT_ATOM_ADB_LENGTH = 162;        /* int: how much of the string is the number */
constexpr uint8_t AMT_ATOM_SERIAL_NUMBER = 163;     /* bytes: the modem's serial number */
constexpr uint8_t AMT_ATOM_PCBA_OPERATION = 190;    /* 1 byte: 1 read, 2 write */
constexpr uint8_t AMT_ATOM_PCBA_SN = 191;           /* string */
constexpr uint8_t AMT_ATOM_HANDSHAKE = 192;     /* int: the operation in a request, the flag in a response */
constexpr uint8_t AMT_ATOM_DEVICE_INFO = 200;   /* string */
constexpr uint8_t AMT_ATOM_WANTED_MODE = 201;   /* int: the mode to switch to */
constexpr uint8_t AMT_ATOM_STANDBY0_RAT = 202;  /* int: the radio access technology of the first standby */
constexpr uint8_t AMT_ATOM_BOOT_DOWNLOAD = 204; /* int: the boot download has finished */
constexpr uint8_t AMT_ATOM_EMMC_INFO = 205;     /* string */

/*
 * Command ids that are served though the catalogue has no name for them: the log calls them "(undefined)". As
 * everywhere, a response id is its request id + 1.
 */
constexpr uint8_t AMT_ADB_SERIAL_NO_CMD = 191;
constexpr uint8_t AMT_ADB_SERIAL_NO_RSPCMD = 192;
constexpr uint8_t AMT_READ_ADC_CMD = 224;
constexpr uint8_t AMT_READ_ADC_RSPCMD = 225;
constexpr uint8_t AMT_CALIBRATE_ADC_CMD = 226;
constexpr uint8_t AMT_CALIBRATE_ADC_RSPCMD = 227;
constexpr uint8_t AMT_READ_ITEM_RESULT_CMD = 228;
constexpr uint8_t AMT_READ_ITEM_RESULT_RSPCMD = 229;
constexpr uint8_t AMT_WRITE_ITEM_RESULT_CMD = 230;
constexpr uint8_t AMT_WRITE_ITEM_RESULT_RSPCMD = 231;
constexpr uint8_t AMT_SWITCH_CHANNEL_CMD = 232;
constexpr uint8_t AMT_SWITCH_CHANNEL_RSPCMD = 233;
constexpr uint8_t AMT_READ_SERIAL_NUMBER_CMD = 234;
constexpr uint8_t AMT_READ_SERIAL_NUMBER_RSPCMD = 235;
constexpr uint8_t AMT_POWER_OFF_CMD = 236;
constexpr uint8_t AMT_POWER_OFF_RSPCMD = 237;
constexpr uint8_t AMT_READ_BOOT_DOWNLOAD_CMD = 244;
constexpr uint8_t AMT_READ_BOOT_DOWNLOAD_RSPCMD = 245;
constexpr uint8_t AMT_READ_EMMC_INFO_CMD = 246;
constexpr uint8_t AMT_READ_EMMC_INFO_RSPCMD = 247;
