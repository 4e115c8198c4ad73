#include "amt/amt-atom.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-file.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "pub/util/util.h"

namespace {

constexpr char SETTING_FILE[] = "/data/etc/storage.config";
constexpr int32_t SETTING_CARD_FIRST = 1;
constexpr char CARD_FIRST_PATH[] = "/storage/sdcard0";
constexpr char CARD_SECOND_PATH[] = "/storage/sdcard1";

const char *external_card_path(int32_t setting)
{
    return setting == SETTING_CARD_FIRST ? CARD_FIRST_PATH : CARD_SECOND_PATH;
}

/* A missing card has no capacity; that is no error. */
uint32_t card_capacity(const char *path)
{
    uint32_t total = 0;
    if (pub_util_get_mount_fs_info(path, &total, nullptr, nullptr) != PUB_ERR_NONE) {
        return 0;
    }
    PUB_LOG(g_amt_device_log, "external tf card capability: %ld KB", static_cast<long>(total));
    return total;
}

} // namespace

int amt_device_tf_card(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    PUB_LOG(g_amt_device_log, "amt_device_tf_card--->will open storage config file: %s", SETTING_FILE);
    int32_t setting = 0;
    if (amt_device_file_read_int(SETTING_FILE, &setting) == PUB_ERR_NONE) {
        PUB_LOG(g_amt_device_log, "amt_device_tf_card--->getted storage config value: %d", setting);
    }
    PUB_LOG(g_amt_device_log, "amt_device_tf_card--->storage config value: %d", setting);

    const char *path = external_card_path(setting);
    PUB_LOG(g_amt_device_log, "amt_device_tf_card--->external sd card path: %s", path);
    const uint32_t capacity = card_capacity(path);
    PUB_LOG(g_amt_device_log, "tf card capability: %ld KB", static_cast<long>(capacity));

    amt_reply_start(rsp_ptr, AMT_READCAPABILITY_CARD_RSPCMD);
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_CARD_CAPACITY, static_cast<int32_t>(capacity));
    amt_packet_add_int(rsp_ptr->m_buf_a, AMT_ATOM_RESULT, 0);
    return amt_handle_send_rsp(channel, rsp_ptr);
}
