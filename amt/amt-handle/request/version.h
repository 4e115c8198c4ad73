#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"
#include "amt/amt-handle/request/ap-version.h"

/* Handlers (see amt_handle_func) of the version request, id 45. Failures are not answered here. */

/* The modules a version is asked of: integer atom 19 of the request. */
constexpr int32_t AMT_PRODUCT_MODULE = 1;
constexpr int32_t AMT_SOFTWARE_MODULE = 16;
constexpr int32_t AMT_L1_MODULE = 17;
constexpr int32_t AMT_HLS_MODULE = 18;
constexpr int32_t AMT_PLATFORM_MODULE = 19;
constexpr int32_t AMT_APP_MODULE = 20;
constexpr int32_t AMT_HARDWARE_MODULE = 32;
constexpr int32_t AMT_WHOLE_MODULE = 64;

/* The name of a module for the log; "(undefined)" for any other value. */
const char *amt_version_module_name(int32_t type);

/*
 * From the app: the fixed version text, or the modem's for the L1 and HLS modules. Returns the status of the
 * send, -101 (bad argument), -111 (no modem, whatever the module) or -100 (unknown module, or the modem gave
 * no version).
 */
int handle_amt_req_version(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* The modem's version of the L1 or HLS module, as handle_amt_req_version answers it. */
int handle_amt_req_l1_hls_version(uint32_t channel, int32_t type, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * From the PC: acknowledges the request once the module is known to be served here, then answers. Returns the
 * status of the send, -101 (bad argument), -104 (L1 and HLS: the modem's own business), -100 (unknown module)
 * or the status of get_ap_sw_version.
 */
int handle_amt_pc_req_version(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Appends atom 18 with the software version text to a response that has been started. */
int set_ap_sw_version_rsp(amt_buf_st *rsp_ptr);
