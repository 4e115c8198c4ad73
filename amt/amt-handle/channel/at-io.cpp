#include "amt/amt-handle/channel/at-io.h"

#include <errno.h>
#include <poll.h>
#include <string_view>
#include <time.h>
#include <unistd.h>

#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/tty.h"
#include "amt/amt-handle/channel/wait.h"
#include "amt/amt-log.h"
#include "pub/error.h"
#include "pub/log/print.h"
#include "pub/util/thread-end.h"

namespace {

constexpr char PROGRAM[] = "vx-kel-amt";

/* The line number in write_at's progress text, which stations' scripts look for: it does not move with the code. */
constexpr int WRITE_AT_LINE = 912;

constexpr char UNSOLICITED_OFF[] = "AT^DLKS=0\r";
constexpr int WAIT_SECONDS = 5;
constexpr uint32_t ANSWER_SIZE = 20;
constexpr uint32_t ANSWER_ROOM = 18;

/* How long to wait before a tty that answers at once, but with nothing or a failure, is asked again, in ms. */
constexpr uint32_t FAILED_TTY_PAUSE_MS = 100;

/* What a failed transfer on the AT tty means: -118 when the tty is lost and may be reopened. */
int get_transfer_error(bool is_write)
{
    if (is_write && g_handle_state.m_is_no_modem != 0) {
        return PUB_ERR_FAIL;
    }
    return errno == EIO ? PUB_ERR_FILE : PUB_ERR_FAIL;
}

/* Whether the line has hung up: then only a reopening brings it back. */
bool is_hung_up(int fd)
{
    pollfd line = {fd, 0, 0};
    return poll(&line, 1, 0) > 0 && (line.revents & (POLLHUP | POLLERR)) != 0;
}

/* One write of the whole text, with errno set on failure. Descriptor 0 is never the modem's. */
ssize_t write_once(const char *text, uint32_t length)
{
    const int fd = g_handle_context.m_fd_at;
    if (fd <= 0) {
        errno = EBADF;
        return -1;
    }
    return write(fd, text, length);
}

/*
 * One read. A line that has hung up reads as empty for ever: that is the EIO of a lost tty. Any other that has
 * nothing may say so at once, and is not asked again at once.
 */
ssize_t read_line(int fd, char *buf, uint32_t length)
{
    const ssize_t count = amt_wait_read(fd, buf, length);
    if (count != 0) {
        return count;
    }
    if (is_hung_up(fd)) {
        errno = EIO;
        return -1;
    }
    pub_util_sleep_ms(FAILED_TTY_PAUSE_MS);
    return 0;
}

ssize_t read_once(char *buf, uint32_t length)
{
    const int fd = g_handle_context.m_fd_at;
    if (fd <= 0) {
        errno = EBADF;
        return -1;
    }
    return read_line(fd, buf, length);
}

int rewrite_after_reopen(const char *text, uint32_t length)
{
    if (const int status = amt_at_open(); status != PUB_ERR_NONE) {
        return status;
    }
    errno = 0; /* a short write has no errno, and shows none of the reopening */
    return write_once(text, length) == static_cast<ssize_t>(length) ? PUB_ERR_NONE : PUB_ERR_FAIL;
}

int reread_after_reopen(char *buf, uint32_t length, ssize_t *count_ptr)
{
    if (const int status = amt_at_open(); status != PUB_ERR_NONE) {
        return status;
    }
    errno = 0;
    *count_ptr = read_once(buf, length);
    return *count_ptr > 0 ? PUB_ERR_NONE : PUB_ERR_FAIL;
}

/* The error lines of the switch-off name the public operation, whichever part has failed. */
constexpr char SWITCH_OFF[] = "disable_unsolicited_code";

int send_switch_off(int fd)
{
    const int ready = amt_wait_writable(fd, WAIT_SECONDS * 1000);
    if (ready == 0) {
        return pub_log_fail({g_amt_handle_log, SWITCH_OFF}, PUB_ERR_TIMEOUT,
                            "wait %d seconds to write time out", WAIT_SECONDS);
    }
    if (ready < 0) {
        return pub_log_call_error({g_amt_handle_log, SWITCH_OFF}, "select", PUB_ERR_FILE);
    }
    const ssize_t written = write(fd, UNSOLICITED_OFF, sizeof(UNSOLICITED_OFF) - 1);
    if (written < 0) {
        return pub_log_call_error({g_amt_handle_log, SWITCH_OFF}, "write", PUB_ERR_FILE);
    }
    if (written != static_cast<ssize_t>(sizeof(UNSOLICITED_OFF) - 1)) {
        PUB_LOG(g_amt_handle_log, "WARNING !");
        PUB_LOG(g_amt_handle_log, "write not completed: to write(%zu) != written(%zd)",
                sizeof(UNSOLICITED_OFF) - 1, written);
        return pub_log_error({g_amt_handle_log, SWITCH_OFF}, PUB_ERR_INCOMPLETE);
    }
    return PUB_ERR_NONE;
}

/* What one wait for the modem's answer has given. */
struct answer_st
{
    int m_status;
    bool m_is_line_lost;
    uint32_t m_length;
    char m_text_a[ANSWER_SIZE];

    bool holds(std::string_view text) const
    {
        return std::string_view(m_text_a, m_length).find(text) != std::string_view::npos;
    }
};

void read_answer_piece(int fd, answer_st *answer_ptr)
{
    const ssize_t count = read_line(fd, answer_ptr->m_text_a, ANSWER_ROOM);
    if (count > 0) {
        answer_ptr->m_length = static_cast<uint32_t>(count);
        return;
    }
    if (count < 0) {
        answer_ptr->m_is_line_lost = errno == EIO;
        answer_ptr->m_status = pub_log_call_error({g_amt_handle_log, SWITCH_OFF}, "read", PUB_ERR_FILE);
        pub_util_sleep_ms(FAILED_TTY_PAUSE_MS);
    }
}

int report_time_out(const timespec &start)
{
    timespec end = {};
    clock_gettime(CLOCK_REALTIME, &end);
    if (end.tv_sec <= start.tv_sec) {
        return PUB_ERR_NONE;
    }
    PUB_LOG(g_amt_handle_log, "read time out: %ld:%ld -> %ld:%ld", static_cast<long>(start.tv_sec),
            start.tv_nsec, static_cast<long>(end.tv_sec), end.tv_nsec);
    return pub_log_error({g_amt_handle_log, SWITCH_OFF}, PUB_ERR_FILE);
}

/* Waits for one piece of the answer. Each piece replaces the one before it. */
answer_st wait_for_answer_piece(int fd)
{
    answer_st answer = {};
    timespec start = {};
    clock_gettime(CLOCK_REALTIME, &start);
    const int ready = amt_wait_readable(fd, WAIT_SECONDS * 1000);
    if (ready > 0) {
        read_answer_piece(fd, &answer);
    } else if (ready == 0) {
        answer.m_status = report_time_out(start);
    } else {
        answer.m_status = pub_log_call_error({g_amt_handle_log, SWITCH_OFF}, "select", PUB_ERR_FILE);
        pub_util_sleep_ms(FAILED_TTY_PAUSE_MS);
    }
    return answer;
}

bool holds_error_result(const answer_st &answer)
{
    return answer.holds("\r\nERROR\r\n") || answer.holds("\r\n+CME ERROR: ") ||
           answer.holds("\r\n+CMS ERROR: ");
}

} // namespace

int write_at(const char *text, uint32_t length)
{
    if (text == nullptr || length == 0) {
        return pub_log_bad_param(g_amt_handle_log, {text == nullptr, length == 0});
    }
    pub_log_entry(g_amt_handle_log);
    pub_print("[%s:L%d]write_at: %s\n", PROGRAM, WRITE_AT_LINE, text);
    const ssize_t written = write_once(text, length);
    int status = written < 0 ? get_transfer_error(true) : PUB_ERR_NONE;
    pub_print("[%s]write_at return:%d\n", PROGRAM, static_cast<int>(written));
    PUB_LOG(g_amt_handle_log, "write_at write_len[%d]", static_cast<int>(written));
    PUB_LOG(g_amt_handle_log, "write_at ret_val[%d]", status);
    if (status == PUB_ERR_FILE) {
        status = rewrite_after_reopen(text, length);
    }
    if (status != PUB_ERR_NONE) {
        return pub_log_error(g_amt_handle_log, status);
    }
    PUB_LOG(g_amt_handle_log, "send ==> %.1023s", text);
    return PUB_ERR_NONE;
}

int read_at(char *buf, uint32_t length, int32_t *count_ptr)
{
    if (buf == nullptr || length == 0 || count_ptr == nullptr) {
        return pub_log_bad_param(g_amt_handle_log, {buf == nullptr, length == 0, count_ptr == nullptr});
    }
    pub_print("[%s]read_at\n", PROGRAM);
    ssize_t count = read_once(buf, length);
    int status = count < 0 ? get_transfer_error(false) : PUB_ERR_NONE;
    buf[count > 0 ? count : 0] = '\0';
    *count_ptr = static_cast<int32_t>(count);
    pub_print("[%s]read_at return:%s\n", PROGRAM, buf);
    PUB_LOG(g_amt_handle_log, "read_at read_len_ptr[%d] buf_ptr[%s]", *count_ptr, buf);
    if (status != PUB_ERR_NONE) {
        PUB_LOG(g_amt_handle_log, "read_at ret_val[%d]", status);
    }
    if (status == PUB_ERR_FILE) {
        status = reread_after_reopen(buf, length, &count);
        buf[count > 0 ? count : 0] = '\0';
        *count_ptr = static_cast<int32_t>(count);
    }
    if (status != PUB_ERR_NONE) {
        return pub_log_error(g_amt_handle_log, status);
    }
    PUB_LOG(g_amt_handle_log, "receive <== %.1023s", buf);
    return PUB_ERR_NONE;
}

int disable_unsolicited_code(int fd)
{
    if (fd <= 0) {
        return pub_log_error({g_amt_handle_log, SWITCH_OFF}, PUB_ERR_PARAM);
    }
    if (const int status = send_switch_off(fd); status != PUB_ERR_NONE) {
        return status;
    }
    /* A silent modem is waited for without limit: without its answer nothing that follows could be told
     * apart. A line that is lost has no answer any more. */
    for (;;) {
        const answer_st answer = wait_for_answer_piece(fd);
        if (answer.m_is_line_lost || answer.holds("\r\nOK\r\n")) {
            return answer.m_status;
        }
        if (holds_error_result(answer)) {
            return pub_log_error({g_amt_handle_log, SWITCH_OFF}, PUB_ERR_FAIL);
        }
    }
}

int amt_at_open()
{
    for (int32_t i = 0; i < AMT_TTY_AT_ATTEMPTS; i++) {
        if (const int status = amt_tty_open_at(); status != PUB_ERR_NONE) {
            return status;
        }
        disable_unsolicited_code(g_handle_context.m_fd_at);
        if (!is_hung_up(g_handle_context.m_fd_at)) {
            return PUB_ERR_NONE;
        }
        pub_util_sleep_ms(FAILED_TTY_PAUSE_MS);
    }
    errno = EIO;
    return PUB_ERR_FILE;
}
