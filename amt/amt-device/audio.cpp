#include <errno.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include "amt/amt-atom.h"
#include "amt/amt-cfg.h"
#include "amt/amt-command.h"
#include "amt/amt-device/device-request.h"
#include "amt/amt-device/hal-library.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-packet.h"
#include "platform/include/audio-loop-hal.h"
#include "pub/error.h"
#include "pub/util/process.h"

namespace {

#define PLAYER_NAME "amt-audio"
#define PLAYER_PATH "/system/bin/" PLAYER_NAME

constexpr char PLAYER_PID_FILE[] = "/tmp/" PLAYER_NAME ".pid";
constexpr uint32_t COMMAND_SIZE = 100;
constexpr char AUDIO_HANDLER[] = "amt_device_audio";

/* Each missing one has its line. */
int check_player()
{
    int status = PUB_ERR_NONE;
    if (access(PLAYER_PATH, F_OK) != 0) {
        status = pub_log_fail({g_amt_device_log, AUDIO_HANDLER}, PUB_ERR_FILE,
                              "access(\"" PLAYER_PATH "\") fail: %d - %s", errno, strerror(errno));
    }
    if (access(g_amt_cfg.m_audio_file_a, F_OK) != 0) {
        status = pub_log_fail({g_amt_device_log, AUDIO_HANDLER}, PUB_ERR_FILE, "access(\"%s\") fail: %d - %s",
                              g_amt_cfg.m_audio_file_a, errno, strerror(errno));
    }
    return status;
}

/* The player puts itself in the background and records its pid, so the command ends at once. */
int start_player()
{
    if (check_player() != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    char command_a[COMMAND_SIZE] = {};
    snprintf(command_a, sizeof(command_a), PLAYER_PATH " %ld %ld %ld %s",
             static_cast<long>(g_amt_cfg.m_audio_sample_rate), static_cast<long>(g_amt_cfg.m_audio_format),
             static_cast<long>(g_amt_cfg.m_audio_frame_count), g_amt_cfg.m_audio_file_a);
    errno = 0;
    if (pub_util_run_shell(command_a) != 0) {
        return pub_log_fail({g_amt_device_log, AUDIO_HANDLER}, PUB_ERR_FILE, "system(%s) fail: %d - %s",
                            command_a, errno, strerror(errno));
    }
    return PUB_ERR_NONE;
}

/* A player that does not run is no error. */
void stop_player()
{
    int32_t is_running = 0;
    int32_t pid = 0;
    pub_util_get_pid_and_check_run(PLAYER_PID_FILE, PLAYER_NAME, &is_running, &pid);
    if (is_running != 0) {
        unlink(PLAYER_PID_FILE);
        kill(pid, SIGKILL);
    }
}

} // namespace

int amt_device_audio(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int32_t flag = amt_packet_get_bool(req_ptr->m_buf_a, AMT_ATOM_SWITCH);
    if (flag == 0) {
        stop_player();
    } else if (start_player() != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    /* Any other value has started the player too, but only 1 is called so. */
    PUB_LOG(g_amt_device_log, "%s audio", flag == 1 ? "start" : "stop");
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_BELL_RSPCMD);
}

int amt_device_audio_loop(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    if (amt_reply_enter(g_amt_device_log, channel, req_ptr, rsp_ptr) != PUB_ERR_NONE) {
        return PUB_ERR_PARAM;
    }
    const int32_t enable = amt_packet_get_bool(req_ptr->m_buf_a, AMT_ATOM_SWITCH) == 1 ? 1 : 0;
    const int32_t type = amt_packet_get_int(req_ptr->m_buf_a, AMT_ATOM_LOOP_TYPE);
    amt_hal_entry_st entry = {};
    if (amt_hal_load(AUDIO_LOOP_HAL_LIBRARY, AUDIO_LOOP_HAL_CODEC_LOOP_TEST, &entry) != PUB_ERR_NONE) {
        return PUB_ERR_FILE;
    }
    PUB_LOG(g_amt_device_log, "will call codec_loop_test. enable:%d; type:%d.", enable, type);
    reinterpret_cast<audio_loop_hal_codec_loop_test_func>(entry.m_entry_ptr)(type, enable);
    PUB_LOG(g_amt_device_log, "stop call codec_loop_test.");
    amt_hal_unload(&entry);
    PUB_LOG(g_amt_device_log, "%s audio-loop", enable == 1 ? "start" : "stop");
    return amt_handle_send_rsp_ok(channel, rsp_ptr, AMT_AUDIOLOOP_RSPCMD);
}
