#pragma once

#include <atomic>
#include <stdint.h>

#include "amt/amt-handle/channel/timer.h"

/*
 * The handshake of a USB-inserted start: the link must be configured in time, the station must send data in
 * time, and neither AC power nor the permission file may forbid it.
 */
struct handshake_state_st
{
    std::atomic<int> m_is_ready;        /* the link is configured, or data has come over it */
    std::atomic<int> m_is_done;         /* the handshake has succeeded */
    std::atomic<int> m_is_ac_power;     /* the start was refused because of AC power */
    std::atomic<int> m_is_property_set; /* the failure property is set, once a process */
    amt_timer_st m_usb_enum_timer;
    amt_timer_st m_handshake_timer;
};
extern handshake_state_st g_handshake_state;

/* Arms the time limit for the USB link to come up: 20 s. */
void amt_handshake_start_usb_enum_timer();

/* Arms the time limit for the station to send data: 5 s. */
void amt_handshake_start_timer();

/* Ends the daemon because the handshake failed: failure property, timers, SIGTERM to the own process. */
void amt_handle_exit_by_handshake();

/* Sets the property that tells the platform why a USB-inserted start has ended. */
void amt_set_handshake_property();

/*
 * Start-up's question whether a USB-inserted start may enter test mode. Returns 0, or -100 after the
 * handshake-failure exit, when AC power or the permission file forbids it. A missing file permits.
 */
int amt_handshake_check_permission();

/*
 * The switch in the permission file: op_type 0 forbids, 1 permits, 2 reads. *flag_ptr gets the number that
 * the file holds afterwards; for 2, 1 when the file cannot be read. Returns 0, -100 (not written) or -101
 * (any other op_type).
 */
int handle_amt_damt1_operation(int op_type, int *flag_ptr);
