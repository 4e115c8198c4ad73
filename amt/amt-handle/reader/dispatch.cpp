#include "amt/amt-handle/reader/dispatch.h"

#include "amt/amt-command.h"
#include "amt/amt-convert.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

uint32_t read_command_id(const amt_buf_st *req_ptr)
{
    const uint8_t id = amt_packet_get_cmd(req_ptr->m_buf_a);
    PUB_LOG(g_amt_handle_log, "receive command id: %d(0x%02X) - %s", id, id, amt_cmd_name_table[id]);
    return id;
}

/* Calls the handler with a clear response, whatever an answer that could not be sent has left in it. */
int call_handler(amt_handle_func handler, uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    amt_handle_clear_buf(rsp_ptr);
    return handler(channel, req_ptr, rsp_ptr);
}

int call_app_handler(uint32_t id)
{
    if (id >= AMT_HANDLE_FUNC_COUNT) {
        return pub_log_fail({g_amt_handle_log, "handle_amt_app_req"}, PUB_ERR_FAIL,
                            "unknown AMT request id: %u", id);
    }
    const amt_handle_func handler = g_handle_context.m_handle_app_func_a[id];
    if (handler == nullptr) {
        return pub_log_fail({g_amt_handle_log, "handle_amt_app_req"}, PUB_ERR_FAIL,
                            "unregistered AMT request id: %u", id);
    }
    return call_handler(handler, AMT_CHANNEL_APP, &g_handle_context.m_req, &g_handle_context.m_rsp_app);
}

void enter_mode_1()
{
    if (g_handle_state.m_amt_mode.exchange(amt_mode_en::PC_PACKETS) != amt_mode_en::PC_PACKETS) {
        PUB_LOG(g_amt_handle_log, "mark to enter amt1");
    }
}

uint32_t unwrap_pc_request()
{
    g_handle_context.m_pc = g_handle_context.m_req;
    if (amt_convert_pc_2_app(&g_handle_context.m_pc) != PUB_ERR_NONE) {
        return AMT_ID_NO_PACKET;
    }
    const uint32_t id = read_command_id(&g_handle_context.m_pc);
    enter_mode_1();
    return id;
}

} // namespace

void handle_amt_app_req()
{
    pub_log_entry(g_amt_handle_log);
    if (g_handle_context.m_req.m_buf_len == 0) {
        pub_log_bad_param(g_amt_handle_log, {false, false, true, false});
        return;
    }
    const uint32_t id = read_command_id(&g_handle_context.m_req);
    if (call_app_handler(id) != PUB_ERR_NONE &&
        amt_handle_send_rsp_err(AMT_CHANNEL_APP, &g_handle_context.m_rsp_app, static_cast<uint8_t>(id + 1),
                                AMT_RESULT_NOT_SERVED) != PUB_ERR_NONE)
    {
        return;
    }
    amt_handle_clear_buf(&g_handle_context.m_req);
}

int handle_amt_pc_req(uint32_t *id_ptr)
{
    const uint32_t id = unwrap_pc_request();
    *id_ptr = id;
    const amt_handle_func handler =
        id < AMT_HANDLE_FUNC_COUNT ? g_handle_context.m_handle_pc_func_a[id] : nullptr;
    if (handler == nullptr) {
        PUB_LOG(g_amt_handle_log, "handle_context_st.m_handle_pc_func_a[%u] =%p", id, nullptr);
        return PUB_ERR_NOT_FOUND;
    }
    if (g_handle_context.m_pc_ack_a[id] == amt_ack_en::DISPATCHER) {
        amt_handle_send_pre_rsp_for_pc(AMT_CHANNEL_PC, &g_handle_context.m_rsp_pc);
    }
    return call_handler(handler, AMT_CHANNEL_PC, &g_handle_context.m_pc, &g_handle_context.m_rsp_pc);
}
