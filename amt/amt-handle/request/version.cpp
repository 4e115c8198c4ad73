#include "amt/amt-handle/request/version.h"

#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/request/ap-version.h"
#include "amt/amt-packet.h"
#include "pub/error.h"

namespace {

/* Stations compare all 64 bytes. */
constexpr char g_fixed_version_a[] = "\rAndroid4.2,2013-01-21"
                                     "\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n"
                                     "\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n\n";
constexpr uint16_t FIXED_VERSION_LENGTH = 64;
static_assert(sizeof(g_fixed_version_a) == FIXED_VERSION_LENGTH + 1);

/* Where the version of a module comes from. */
enum class source_en : uint8_t
{
    NONE,     /* no such module */
    FIXED,    /* the fixed text */
    SOFTWARE, /* the application side's software text */
    MODEM
};

struct module_st
{
    int32_t m_type;
    const char *m_name_ptr;
    source_en m_app_source;
    source_en m_pc_source;
};

constexpr module_st g_module_a[] = {
    {AMT_PRODUCT_MODULE, "AMT_PRODUCT_MODULE", source_en::FIXED, source_en::FIXED},
    {AMT_SOFTWARE_MODULE, "AMT_SOFTWARE_MODULE", source_en::FIXED, source_en::SOFTWARE},
    {AMT_L1_MODULE, "AMT_L1_MODULE", source_en::MODEM, source_en::MODEM},
    {AMT_HLS_MODULE, "AMT_HLS_MODULE", source_en::MODEM, source_en::MODEM},
    {AMT_PLATFORM_MODULE, "AMT_PLATFORM_MODULE", source_en::FIXED, source_en::FIXED},
    {AMT_APP_MODULE, "AMT_APP_MODULE", source_en::FIXED, source_en::FIXED},
    {AMT_HARDWARE_MODULE, "AMT_HARDWARE_MODULE", source_en::FIXED, source_en::FIXED},
    {AMT_WHOLE_MODULE, "AMT_WHOLE_MODULE", source_en::FIXED, source_en::FIXED},
};

constexpr module_st g_unknown_module = {0, "(undefined)", source_en::NONE, source_en::NONE};

const module_st &find_module(int32_t type)
{
    for (const module_st &module : g_module_a) {
        if (module.m_type == type) {
            return module;
        }
    }
    return g_unknown_module;
}

/* Reads the wanted module from the request and logs it. */
int32_t get_type(const amt_buf_st *req_ptr)
{
    const int32_t type = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_MODULE);
    PUB_LOG(g_amt_handle_log, "version type: 0x%02x - %s", static_cast<unsigned int>(type),
            find_module(type).m_name_ptr);
    return type;
}

void start_version(amt_buf_st *rsp_ptr, int32_t type)
{
    amt_reply_start(rsp_ptr, AMT_VERSION_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_MODULE, type);
}

void add_version(amt_buf_st *rsp_ptr, const void *version, uint32_t length)
{
    amt_packet_add_bytes(rsp_ptr->m_buf_a, AMT_ATOM_VERSION, static_cast<const uint8_t *>(version),
                         static_cast<uint16_t>(length));
}

int fail_unknown_type(int32_t type, const pub_log_place_st &place = g_amt_handle_log)
{
    return pub_log_fail(place, PUB_ERR_FAIL, "unknown version type: 0x%02x", static_cast<unsigned int>(type));
}

} // namespace

const char *amt_version_module_name(int32_t type)
{
    return find_module(type).m_name_ptr;
}

int handle_amt_req_version(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter_modem(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    const int32_t type = get_type(req_ptr);
    const source_en source = find_module(type).m_app_source;
    if (source == source_en::NONE) {
        return fail_unknown_type(type);
    }
    if (source == source_en::MODEM) {
        return handle_amt_req_l1_hls_version(channel, type, req_ptr, rsp_ptr);
    }
    start_version(rsp_ptr, type);
    add_version(rsp_ptr, g_fixed_version_a, FIXED_VERSION_LENGTH);
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int handle_amt_req_l1_hls_version(uint32_t channel, int32_t type, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_handle_log);
    const bool is_none = channel == AMT_CHANNEL_NONE;
    const bool is_type_bad = type != AMT_L1_MODULE && type != AMT_HLS_MODULE;
    const bool is_req_empty = req_ptr != nullptr && req_ptr->m_buf_len == 0;
    if (is_none || is_type_bad || req_ptr == nullptr || is_req_empty || rsp_ptr == nullptr) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_PARAM, "%d, module_en:%d, %d, %d, %d", is_none, type,
                            req_ptr == nullptr, is_req_empty, rsp_ptr == nullptr);
    }
    uint8_t version_a[AMT_MODEM_VERSION_SIZE];
    uint32_t length = 0;
    if (get_l1_hls_version(type, version_a, &length) != PUB_ERR_NONE) {
        return pub_log_fail(g_amt_handle_log, PUB_ERR_FAIL, "get version failure for type: 0x%02x",
                            static_cast<unsigned int>(type));
    }
    PUB_LOG(g_amt_handle_log, "get version success.type:%d, version:[len:%u content:%s]", type, length,
            reinterpret_cast<const char *>(version_a));
    start_version(rsp_ptr, type);
    add_version(rsp_ptr, version_a, length);
    return amt_reply_finish_ok(channel, rsp_ptr);
}

int handle_amt_pc_req_version(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    int status = amt_reply_enter(g_amt_handle_log, channel, req_ptr, rsp_ptr);
    if (status != PUB_ERR_NONE) {
        return status;
    }
    const int32_t type = get_type(req_ptr);
    const source_en source = find_module(type).m_pc_source;
    if (source == source_en::MODEM) {
        return PUB_ERR_NOT_FOUND;
    }
    if (source == source_en::NONE) {
        return fail_unknown_type(type);
    }
    /* An acknowledgement that cannot be sent does not keep the answer back. */
    amt_handle_send_pre_rsp_for_pc(channel, rsp_ptr);
    start_version(rsp_ptr, type);
    if (source == source_en::FIXED) {
        add_version(rsp_ptr, g_fixed_version_a, FIXED_VERSION_LENGTH);
    } else {
        status = set_ap_sw_version_rsp(rsp_ptr);
    }
    return status != PUB_ERR_NONE ? status : amt_reply_finish_ok(channel, rsp_ptr);
}

int set_ap_sw_version_rsp(amt_buf_st *rsp_ptr)
{
    pub_log_entry(g_amt_handle_log);
    if (rsp_ptr == nullptr) {
        return pub_log_error(g_amt_handle_log, PUB_ERR_PARAM);
    }
    char version_a[AMT_AP_VERSION_SIZE] = {};
    uint32_t length = 0;
    if (const int status = get_ap_sw_version(version_a, &length); status != PUB_ERR_NONE) {
        return pub_log_fail(g_amt_handle_log, status, "failed to get ap's sw version");
    }
    add_version(rsp_ptr, version_a, length);
    return PUB_ERR_NONE;
}
