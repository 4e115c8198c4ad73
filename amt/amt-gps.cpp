#include "amt/amt-gps.h"

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-device/radio-step.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-log.h"
#include "amt/amt-packet.h"
#include "platform/include/ldt.h"
#include "pub/error.h"
#include "pub/util/process.h"

namespace {

constexpr char CONTROL_HANDLER[] = "amt_gps_control";
constexpr char READ_HANDLER[] = "amt_gps_read_result";

constexpr int32_t OPERATION_STOP = 0;
constexpr int32_t OPERATION_CHECK = 2;

constexpr amt_radio_step_st CHECK_STEP = {&g_amt_gps_log, CONTROL_HANDLER, "GPS connectivity check",
                                          "ldt_gpsCheck"};
constexpr amt_radio_step_st STOP_STEP = {&g_amt_gps_log, CONTROL_HANDLER, "GPS stop", "ldt_gpsCtrl"};
constexpr amt_radio_step_st START_STEP = {&g_amt_gps_log, CONTROL_HANDLER, "GPS-start", "ldt_gpsCtrl"};
constexpr amt_radio_step_st READ_STEP = {&g_amt_gps_log, READ_HANDLER, "GPS-READ-SIGNAL", "ldt_gpsCtrl"};

int check_connectivity()
{
    amt_radio_step_start(CHECK_STEP);
    return amt_radio_step_end(CHECK_STEP, ldt_gpsCheck());
}

int switch_gps(const amt_radio_step_st &step, int32_t gps_operation)
{
    amt_radio_step_start(step);
    return amt_radio_step_end(step, ldt_gpsCtrl(gps_operation, 0, nullptr, nullptr));
}

/* An unknown operation starts the GPS, on purpose. */
int operate(int32_t operation)
{
    switch (operation) {
    case OPERATION_CHECK:
        return check_connectivity();
    case OPERATION_STOP:
        return switch_gps(STOP_STEP, LDT_STOP);
    default:
        return switch_gps(START_STEP, LDT_START);
    }
}

} // namespace

int amt_gps_control(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_gps_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int32_t operation = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_GPS_OPERATION);
    PUB_LOG(g_amt_gps_log, "amt_gps_control is_start:%d", operation);
    const int status = operate(operation);
    return status == PUB_ERR_NONE ? amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_GPS_CONTROL_RSPCMD) : status;
}

int amt_gps_test(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_check(g_amt_gps_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    /* Not AMT_GPS_TEST_RSPCMD: stations expect the id of the GPS control here. */
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_GPS_CONTROL_RSPCMD);
}

int amt_gps_read_result(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_gps_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        pub_util_run_shell("echo gps read result:invalid param > /data/local/wifi/gps_get_result.txt");
        return PUB_ERR_PARAM;
    }
    const int32_t index = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_GPS_SATELLITE);
    PUB_LOG(g_amt_gps_log, "GPS-READ-SIGNAL start. index:%d", index);
    int32_t svid = 0;
    int32_t cnr = 0;
    const int32_t answered = ldt_gpsCtrl(LDT_GPS_READ_SIGNAL, index, &svid, &cnr);
    PUB_LOG(g_amt_gps_log, "GPS-READ-SIGNAL end. return:%d; svid:%d; cnr:%d.", answered, svid, cnr);
    if (amt_radio_step_check(READ_STEP, answered) != PUB_ERR_NONE) {
        return PUB_ERR_FAIL;
    }
    amt_reply_start(rsp_ptr, AMT_GPS_READ_RESULT_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_GPS_CARRIER_TO_NOISE, cnr);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_GPS_SATELLITE, svid);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, 0);
    const int status = channel == AMT_CHANNEL_PC ? amt_convert_app_2_pc(rsp_ptr) : PUB_ERR_NONE;
    amt_handle_send_rsp(channel, rsp_ptr);
    return status;
}
