#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/* Handlers (see amt_handle_func) of the version request, id 45. Failures are not answered here. */

/* The modules a version is asked of: AMT_ATOM_MODULE of the request. */
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
 * send, PUB_ERR_PARAM (bad argument), PUB_ERR_NO_MODEM (whatever the module) or PUB_ERR_FAIL (unknown module,
 * or the modem gave no version).
 */
int handle_amt_req_version(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* The modem's version of the L1 or HLS module, as handle_amt_req_version answers it. */
int handle_amt_req_l1_hls_version(uint32_t channel, int32_t type, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/*
 * From the PC: acknowledges the request once the module is known to be served here, then answers. Returns the
 * status of the send, PUB_ERR_PARAM (bad argument), PUB_ERR_NOT_FOUND (L1 and HLS: the modem's own business),
 * PUB_ERR_FAIL (unknown module) or the status of get_ap_sw_version.
 */
int handle_amt_pc_req_version(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr);

/* Appends AMT_ATOM_VERSION with the software version text to a response that has been started. */
int set_ap_sw_version_rsp(amt_buf_st *rsp_ptr);

/* Room for the version that the modem gives for one of its modules, in bytes. */
constexpr uint32_t AMT_MODEM_VERSION_SIZE = 410;

/*
 * Asks the modem for the version of module type (17 or 18): version (AMT_MODEM_VERSION_SIZE bytes, zeroed
 * behind the text) gets its bytes, *length_ptr their number, which may be 0. Returns 0;
 * PUB_ERR_PARAM for an empty answer; PUB_ERR_FAIL when it is not well-formed or the modem refused; or the
 * failing status of the AT channel.
 */
int get_l1_hls_version(int32_t type, uint8_t *version, uint32_t *length_ptr);
