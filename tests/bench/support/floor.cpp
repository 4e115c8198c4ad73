#include "tests/bench/support/floor.h"

#include <errno.h>
#include <stdarg.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include "platform/include/android/log.h"
#include "tests/bench/support/lines.h"

/* One record of the daemon's. */
#define RECORD(...) __android_log_print(ANDROID_LOG_DEBUG, "vx-kel-amt", __VA_ARGS__)

namespace {

using namespace std::string_literals;

constexpr char DUMP[] = "%s: (data_len = %u) -- %s";

/* The handset's line to the PC is this descriptor of the daemon. */
constexpr int PC_FD = 4;

const std::string g_packet_request =
    "\xAA\xBB\xCC\xDD\x0E\x00\x00\x00\x02\x00\x00\x00\x06\x00\xBB\xB0\x00\x00\xAF\x7C\xAC\xF7"s;
const std::string g_acknowledgement = "\xAA\xBB\xCC\xDD\x08\x00\x00\x00\x02\x02\x00\x00\x76\x4A\xEE\x1D"s;
const std::string g_packet_response =
    "\xAA\xBB\xCC\xDD\x17\x00\x00\x00\x02\x00\x00\x00\x0F\x00\xBB\xAF\x09\x00\xEE\x01\x01\x04\x00\x00\x00\x00"
    "\x00\x9B\x61\xFE\xEC"s;

/* Acknowledged, then answered. */
void answer_packet(int line, int)
{
    RECORD(DUMP, "handle PC req data: ", 22U, "AABBCCDD0E000000020000000600BBB00000AF7CACF7");
    RECORD("%s()", "amt_convert_pc_2_app");
    RECORD("receive command id: %d(0x%02X) - %s", 176, 176U, "AMT_GPS_TEST_CMD");
    write_whole(line, g_acknowledgement);
    RECORD(DUMP, "send PC rsp data: ", 16U, "AABBCCDD0800000002020000764AEE1D");
    RECORD("%s()", "amt_convert_app_2_pc");
    write_whole(line, g_packet_response);
    RECORD(DUMP, "send PC rsp data: ", 31U, "AABBCCDD17000000020000000F00BBAF0900EE01010400000000009B61FEEC");
    RECORD("handle_amt_imei_and_sn--->req_id_en:%u.", 176U);
    RECORD("read_pc_loop, read ready, m_fd_pc=%d", PC_FD);
}

void answer_text(int line, int)
{
    RECORD(DUMP, "handle PC req data: ", 13U, "41545E444254414444523D3F0D");
    RECORD("%s()", "amt_convert_pc_2_app");
    RECORD("handle_context_st.m_handle_pc_func_a[%u] =%p", 255U, nullptr);
    RECORD("handle_amt_imei_and_sn--->req_id_en:%u.", 255U);
    write_whole(line, "\r\nOK\r\n"s);
    RECORD(DUMP, "send PC rsp data: ", 6U, "0D0A4F4B0D0A");
    RECORD("read_pc_loop, read ready, m_fd_pc=%d", PC_FD);
}

const std::string g_modem_command = "AT^DTTEST=07\r";
constexpr char MODEM_ANSWER[] = "\r\n^DTTEST: 0800000000383630303030303030303030303137\r\n\r\nOK\r\n";
const std::string g_tunnel_response =
    "\x23\x00\xBB\x08\x1D\x00\xEE\x01\x01\x04\x00\x00\x00\x00\x00\xEE\x15\x03\x0F\x00"
    "860000000000017"s;

/* Progress texts go to standard output, a write each. */
__attribute__((format(printf, 1, 2))) void print_progress(const char *format, ...)
{
    char text_a[512];
    va_list args;
    va_start(args, format);
    const int length = vsnprintf(text_a, sizeof(text_a), format, args);
    va_end(args);
    write_whole(STDOUT_FILENO, text_a, static_cast<size_t>(length));
}

/* What the modem says is what is compared with the ready answer: it may come in pieces. */
void await_modem(int modem)
{
    char answer_a[sizeof(MODEM_ANSWER)];
    size_t held = 0;
    while (held < sizeof(MODEM_ANSWER) - 1) {
        const ssize_t count = read(modem, answer_a + held, sizeof(MODEM_ANSWER) - 1 - held);
        if (count <= 0) {
            die("the modem");
        }
        held += static_cast<size_t>(count);
    }
    if (memcmp(answer_a, MODEM_ANSWER, sizeof(MODEM_ANSWER) - 1) != 0) {
        errno = EPROTO;
        die("the modem's answer");
    }
}

void answer_tunnel(int line, int modem)
{
    RECORD(DUMP, "handle APP req data: ", 6U, "0600BB070000");
    RECORD("%s()", "handle_amt_app_req");
    RECORD("receive command id: %d(0x%02X) - %s", 7, 7U, "AMT_READIMEI_CMD");
    RECORD("%s()", "amt_modem_handle_req");
    RECORD("%s()", "amt_convert_req_amt_data_2_at_data");
    RECORD("%s()", "write_at");
    print_progress("[%s:L%d]write_at: %s\n", "vx-kel-amt", 912, g_modem_command.c_str());
    write_whole(modem, g_modem_command);
    print_progress("[%s]write_at return:%d\n", "vx-kel-amt", 13);
    RECORD("write_at write_len[%d]", 13);
    RECORD("write_at ret_val[%d]", 0);
    RECORD("send ==> %.1023s", g_modem_command.c_str());
    print_progress("[%s]read_at\n", "vx-kel-amt");
    await_modem(modem);
    print_progress("[%s]read_at return:%s\n", "vx-kel-amt", MODEM_ANSWER);
    RECORD("read_at read_len_ptr[%d] buf_ptr[%s]", 59, MODEM_ANSWER);
    RECORD("receive <== %.1023s", MODEM_ANSWER);
    RECORD("%s()", "amt_convert_rsp_at_data_2_amt_data");
    write_whole(line, g_tunnel_response);
    RECORD(DUMP, "send APP rsp data: ", 35U,
           "2300BB081D00EE0101040000000000EE15030F00383630303030303030303030303137");
}

const floor_st g_floor_a[] = {
    {"packet", g_packet_request, g_acknowledgement.size() + g_packet_response.size(), 8, answer_packet},
    {"text", "AT^DBTADDR=?\r", 6, 6, answer_text},
    {"tunnel", "\x06\x00\xBB\x07\x00\x00"s, g_tunnel_response.size(), 13, answer_tunnel},
};

} // namespace

const floor_st &find_floor(const char *name)
{
    for (const floor_st &floor : g_floor_a) {
        if (strcmp(floor.m_name_ptr, name) == 0) {
            return floor;
        }
    }
    errno = EINVAL;
    die(name);
}

void run_floor(const floor_st &floor, int line, int modem)
{
    char buf_a[4096];
    for (;;) {
        const ssize_t count = read(line, buf_a, sizeof(buf_a));
        if (count != static_cast<ssize_t>(floor.m_request.size())) {
            die("the floor's request");
        }
        floor.m_answer(line, modem);
    }
}
