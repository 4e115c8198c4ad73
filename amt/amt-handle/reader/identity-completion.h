#pragma once

#include "amt/amt-buf.h"

/*
 * Looks into what the modem has said for its answer to a pending identity write, and saves the captured value
 * when the modem has accepted it. Any other answer leaves the write pending. The buffer stays as it is.
 */
void amt_identity_complete(const amt_buf_st *modem_ptr);
