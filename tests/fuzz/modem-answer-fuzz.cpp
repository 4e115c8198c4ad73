#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include "amt/amt-command.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/request/modem-tunnel.h"
#include "amt/amt-handle/request/modem-value.h"
#include "amt/amt-handle/request/version.h"
#include "amt/amt-packet.h"
#include "tests/fuzz/support/input.h"

/*
 * The first byte chooses a request that the modem answers, the second how its answer is cut into pieces; the
 * rest is what the modem says. Its line is a socket that keeps the pieces apart, and that has nothing more to
 * read behind the last one.
 */
namespace {

constexpr size_t MOST_BYTES = 8192;

/* Send buffers hold a few hundred pieces, whatever their size. */
constexpr size_t MOST_PIECES = 64;

void open_outputs()
{
    static bool is_open = false;
    if (is_open) {
        return;
    }
    is_open = true;
    const int fd = open("/dev/null", O_WRONLY | O_CLOEXEC);
    FUZZ_REQUIRE(fd > 0 && dup2(fd, STDOUT_FILENO) == STDOUT_FILENO);
    g_handle_context.m_pty.m_ptm_fd = fd; /* the app's side */
}

void say(int fd, const std::vector<uint8_t> &answer, uint8_t cut)
{
    const size_t least = answer.size() / MOST_PIECES + 1;
    const size_t piece = cut == 0 ? MOST_BYTES : least + cut;
    for (size_t done = 0; done < answer.size(); done += piece) {
        const size_t rest = answer.size() - done;
        const size_t count = rest < piece ? rest : piece;
        FUZZ_REQUIRE(send(fd, answer.data() + done, count, 0) == static_cast<ssize_t>(count));
    }
}

void ask(uint8_t choice)
{
    static amt_buf_st req;
    static amt_buf_st rsp;
    amt_packet_init(req.m_buf_a, AMT_READIMEI_CMD);
    amt_packet_add_int(req.m_buf_a, 1, 0);
    req.m_buf_len = amt_packet_get_length(req.m_buf_a);
    amt_handle_clear_buf(&rsp);
    uint8_t version_a[AMT_MODEM_VERSION_SIZE];
    uint32_t version_length = 0;
    switch (choice % 5) {
    case 0:
        amt_modem_handle_req(AMT_CHANNEL_APP, &req, &rsp);
        break;
    case 1:
        if (get_l1_hls_version(17, version_a, &version_length) == 0) {
            FUZZ_REQUIRE(version_length <= sizeof(version_a));
        }
        break;
    case 2:
        amt_modem_handle_read_board(AMT_CHANNEL_APP, &req, &rsp);
        break;
    case 3:
        amt_modem_handle_read_outdate(AMT_CHANNEL_APP, &req, &rsp);
        break;
    default:
        amt_channel_switch(AMT_CHANNEL_APP, &req, &rsp);
        break;
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    open_outputs();
    fuzz_input_c input(data, size);
    const uint8_t choice = input.take_u8();
    const uint8_t cut = input.take_u8();
    const std::vector<uint8_t> answer = input.take(MOST_BYTES);

    int pair_a[2];
    FUZZ_REQUIRE(socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_NONBLOCK | SOCK_CLOEXEC, 0, pair_a) == 0);
    g_handle_context.m_fd_at = pair_a[0];
    say(pair_a[1], answer, cut);
    ask(choice);
    g_handle_context.m_fd_at = 0;
    close(pair_a[0]);
    close(pair_a[1]);
    return 0;
}
