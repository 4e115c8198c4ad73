#include <algorithm>
#include <atomic>
#include <fcntl.h>
#include <setjmp.h>
#include <string>
#include <unistd.h>

#include "amt/amt-atom.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/reply.h"
#include "amt/amt-handle/reader/identity-write.h"
#include "amt/amt-handle/reader/reader.h"
#include "amt/amt-handle/reader/registry.h"
#include "amt/amt-handle/reader/usb-event.h"
#include "amt/amt-packet.h"
#include "pub/error.h"
#include "tests/fuzz/support/handset-files.h"
#include "tests/fuzz/support/hub-lines.h"
#include "tests/fuzz/support/input.h"
#include "tests/fuzz/support/scripted-ldt.h"

/*
 * The input is a run of events at the hub of the PC path: the PC or the modem says something, the kernel tells of
 * the cable, the platform changes its mind. The service's own reader loops carry them out; what they remember, they
 * remember from one event to the next, and forget with the input.
 */
extern "C" {
[[noreturn]] void __wrap__Z14amt_reader_endPSt6atomicIiEP13amt_worker_st(std::atomic<int> *, amt_worker_st *);
[[noreturn]] void __wrap_abort();
}

namespace {

constexpr size_t MOST_EVENTS = 24;
constexpr size_t MOST_SAID = 4095;
/* Pauses of the reader loops when a read has brought nothing; no handler's pause is as long. */
constexpr uint32_t EMPTY_READ_PAUSE_MS = 100;
/* Ids that only stand-ins serve: the start that forks, and some that nobody has. */
constexpr uint8_t BLUETOOTH = 170;
constexpr uint8_t STAND_IN_FIRST = 200;
constexpr uint8_t STAND_IN_LAST = 207;

const std::string ACK("\xAA\xBB\xCC\xDD\x08\0\0\0\x02\x02\0\0\x76\x4A\xEE\x1D", 16);
const std::string MAGIC("\xAA\xBB\xCC\xDD", 4);
const std::string PROBE_COMMAND = "AT;^DLKS=1\r";
constexpr size_t ENVELOPE_SIZE = 16;

enum class place_en : uint8_t
{
    PC_LOOP,
    MODEM_LOOP
};

struct run_st
{
    fuzz_input_c *m_input_ptr;
    hub_lines_c *m_lines_ptr;
    size_t m_events;
    place_en m_place;
    std::string m_held; /* the request that was refused, which the next one is appended to */
    std::string m_modem_said;
    std::string m_said;     /* what the PC has said last; empty when it was something else that happened */
    bool m_is_refused;      /* whether an error packet has been heard since */
    sigjmp_buf m_pc_end;    /* where the PC's loop is left to */
    sigjmp_buf m_modem_end; /* where the modem's is */
};
run_st *g_run_ptr = nullptr;

/* Stands in for a handler: its atom 1 says what becomes of the request. */
int serve(uint32_t channel, amt_buf_st *req_ptr, amt_buf_st *rsp_ptr)
{
    FUZZ_REQUIRE(channel == AMT_CHANNEL_PC && req_ptr == &g_handle_context.m_pc);
    FUZZ_REQUIRE(rsp_ptr->m_buf_len == 0 && rsp_ptr->m_buf_a[0] == 0);
    const int32_t status = amt_packet_get_int(req_ptr->m_buf_a, 1);
    const uint8_t id = amt_packet_get_cmd(req_ptr->m_buf_a);
    return status != 0 ? status : amt_handle_send_rsp_ok(channel, rsp_ptr, static_cast<uint8_t>(id + 1));
}

uint32_t number_at(const std::string &text, size_t place)
{
    uint32_t number = 0;
    memcpy(&number, text.data() + place, sizeof(number));
    return number;
}

/* An answer in its envelope, or a text: never anything else. */
void require_answer(const std::string &piece)
{
    if (piece.compare(0, MAGIC.size(), MAGIC) != 0) {
        FUZZ_REQUIRE(piece.size() >= 6 && piece.compare(0, 2, "\r\n") == 0 &&
                     piece.compare(piece.size() - 2, 2, "\r\n") == 0);
        return;
    }
    FUZZ_REQUIRE(piece.size() >= ENVELOPE_SIZE + 6 && number_at(piece, 4) + 8 == piece.size());
    FUZZ_REQUIRE(number_at(piece, 8) == 2);
    const size_t summed = piece.size() - 4;
    FUZZ_REQUIRE(amt_checksum(reinterpret_cast<const uint8_t *>(piece.data()),
                              static_cast<uint32_t>(summed)) == number_at(piece, summed));
    const auto *const packet = reinterpret_cast<const uint8_t *>(piece.data()) + 12;
    FUZZ_REQUIRE(amt_packet_get_length(packet) + ENVELOPE_SIZE == piece.size() && packet[2] == 0xBB);
    if (amt_packet_get_int(packet, AMT_ATOM_RESULT) == AMT_RESULT_NOT_SERVED) {
        g_run_ptr->m_is_refused = true;
    }
}

/* Everything that the PC's request has led to. */
void require_served()
{
    run_st &run = *g_run_ptr;
    const amt_buf_st &req = g_handle_context.m_req;
    const std::string request = run.m_held + run.m_said;
    size_t heard = 0;
    while (const auto piece = run.m_lines_ptr->heard_by_pc()) {
        if (*piece != ACK) {
            require_answer(*piece);
        }
        heard++;
    }
    if (const auto piece = run.m_lines_ptr->heard_by_modem()) {
        FUZZ_REQUIRE(*piece == request || *piece == PROBE_COMMAND);
        FUZZ_REQUIRE(!run.m_lines_ptr->heard_by_modem());
        heard++;
    }
    FUZZ_REQUIRE(heard > 0);
    FUZZ_REQUIRE(req.m_buf_a[AMT_HELD_SIZE] == 0);
    run.m_held.assign(reinterpret_cast<const char *>(req.m_buf_a), req.m_buf_len);
    if (req.m_buf_len == 0) {
        const uint8_t *const end = req.m_buf_a + sizeof(req.m_buf_a);
        FUZZ_REQUIRE(std::all_of(req.m_buf_a, end, [](uint8_t byte) { return byte == 0; }));
        return;
    }
    FUZZ_REQUIRE(run.m_held == request || run.m_held == PROBE_COMMAND);
    FUZZ_REQUIRE(run.m_is_refused);
}

std::string take_string(size_t most)
{
    fuzz_input_c &input = *g_run_ptr->m_input_ptr;
    const std::vector<uint8_t> taken = input.take(input.take_u16() % (most + 1));
    return {taken.begin(), taken.end()};
}

/* A packet for a handler, put together so that the engine need not find the frame. */
std::string take_packet()
{
    fuzz_input_c &input = *g_run_ptr->m_input_ptr;
    uint8_t packet_a[AMT_PACKET_SIZE] = {};
    amt_packet_init(packet_a, input.take_u8());
    for (uint8_t left = input.take_u8() % 5; left > 0; left--) {
        const uint8_t atom = input.take_u8();
        if (input.take_u8() % 2 == 0) {
            amt_packet_add_int(packet_a, atom, static_cast<int32_t>(input.take_u32()));
        } else {
            amt_packet_add_string(packet_a, atom, take_string(120).c_str());
        }
    }
    const std::string packet(reinterpret_cast<const char *>(packet_a), amt_packet_get_length(packet_a));
    return MAGIC + std::string(8, '\0') + packet + std::string(4, '\0');
}

/* Whoever leaves the PC's loop from in here leaves nothing behind: the text is the run's. */
void hear_modem()
{
    run_st &run = *g_run_ptr;
    run.m_modem_said = take_string(MOST_SAID);
    if (run.m_modem_said.empty()) {
        return;
    }
    run.m_lines_ptr->say_modem(run.m_modem_said);
    run.m_place = place_en::MODEM_LOOP;
    if (sigsetjmp(run.m_modem_end, 0) == 0) {
        amt_handle_read_modem_loop();
    }
    run.m_place = place_en::PC_LOOP;
    FUZZ_REQUIRE(run.m_lines_ptr->heard_by_pc() == run.m_modem_said && !run.m_lines_ptr->heard_by_pc());
}

void hear_kernel()
{
    static amt_usb_event_st event;
    const std::string text = take_string(AMT_USB_EVENT_SIZE);
    event.m_length = static_cast<uint32_t>(text.copy(event.m_text_a, text.size()));
    event.m_text_a[event.m_length] = '\0';
    amt_usb_event_serve(event);
}

void change_platform()
{
    const std::string statuses = take_string(8);
    scripted_ldt_set({statuses.begin(), statuses.end()});
}

/* The next event; the PC's loop goes on with it, or comes back for the one behind. */
void do_event()
{
    run_st &run = *g_run_ptr;
    run.m_said.clear();
    const uint8_t kind = run.m_input_ptr->take_u8() % 8;
    if (kind < 5) {
        run.m_said = kind < 2 ? take_packet() : take_string(MOST_SAID);
        const size_t room = AMT_HELD_SIZE - run.m_held.size();
        run.m_said.resize(std::min(run.m_said.size(), room));
    } else if (kind == 5) {
        hear_modem();
    } else if (kind == 6) {
        hear_kernel();
    } else {
        change_platform();
    }
    run.m_is_refused = false;
    run.m_said.empty() ? run.m_lines_ptr->be_silent() : run.m_lines_ptr->say_pc(run.m_said);
}

/* A reader has nothing to read: the modem's has done its work, the PC's gets the next event. */
void pause_reader(uint32_t ms)
{
    run_st &run = *g_run_ptr;
    if (ms != EMPTY_READ_PAUSE_MS) {
        return;
    }
    if (run.m_place == place_en::MODEM_LOOP) {
        siglongjmp(run.m_modem_end, 1);
    }
    if (!run.m_said.empty()) {
        require_served();
    }
    const bool is_full = run.m_held.size() == AMT_HELD_SIZE;
    if (is_full || run.m_events++ == MOST_EVENTS || run.m_input_ptr->is_empty()) {
        siglongjmp(run.m_pc_end, 1);
    }
    do_event();
}

/* Handlers tell of their progress there. */
void silence_output()
{
    static bool is_silent = false;
    if (!is_silent) {
        const int fd = open("/dev/null", O_WRONLY | O_CLOEXEC);
        is_silent = fd > 0 && dup2(fd, STDOUT_FILENO) == STDOUT_FILENO;
        FUZZ_REQUIRE(is_silent);
    }
}

void begin()
{
    silence_output();
    handset_files_begin();
    handset_files_set_pause(pause_reader);
    scripted_ldt_set({});
    amt_handle_clear_context();
    amt_handle_register_all();
    amt_handle_reg_handle_func(AMT_TABLE_PC, BLUETOOTH, serve);
    for (uint32_t id = STAND_IN_FIRST; id <= STAND_IN_LAST; id++) {
        amt_handle_reg_handle_func(AMT_TABLE_PC, id, serve);
    }
    amt_identity_reset();
    g_usb_activate = 0;
    g_handle_state.m_amt_mode = amt_mode_en::PC_PACKETS;
    g_handle_state.m_usb_state = amt_usb_en::UNKNOWN;
}

} // namespace

/* The service would end here, which none of these events is a reason for. */
void __wrap__Z14amt_reader_endPSt6atomicIiEP13amt_worker_st(std::atomic<int> *, amt_worker_st *)
{
    FUZZ_REQUIRE(!"the service goes on");
    _exit(1);
}

/* A number of more than 4 bytes ends the service on purpose, whoever sends it. */
void __wrap_abort()
{
    siglongjmp(g_run_ptr->m_pc_end, 1);
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size)
{
    begin();
    fuzz_input_c input(data, size);
    hub_lines_c lines;
    static run_st run;
    run.m_input_ptr = &input;
    run.m_lines_ptr = &lines;
    run.m_events = 0;
    run.m_place = place_en::PC_LOOP;
    run.m_held.clear();
    run.m_said.clear();
    g_run_ptr = &run;
    lines.be_silent();
    if (sigsetjmp(run.m_pc_end, 0) == 0) {
        amt_handle_read_pc_loop();
    }
    handset_files_end();
    return 0;
}
