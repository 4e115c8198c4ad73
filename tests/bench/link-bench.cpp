/*
 * What the daemon costs on the wire, beside what the wire and the log cost by themselves.
 *
 *   link-bench round-trip DAEMON_PID LINE_FD packet|text THREADS ROUNDS
 *       request to whole response over the PC line, against the floor (support/floor.h) on a pseudo-terminal
 *       of its own, in a process of that many threads, all but one of them asleep
 *   link-bench tunnel DAEMON_PID APP_FD MODEM_FD ROUNDS
 *       a request over the app line that the modem answers, against the floor between a pseudo-terminal of
 *       its own and the same modem
 *   link-bench pass-through DAEMON_PID PC_FD MODEM_FD BYTES ROUNDS
 *       BYTES bytes from one line to the other as fast as they go, and ROUNDS single lines, in each direction,
 *       against socat between two pseudo-terminals
 *   link-bench start PROGRAM ARGUMENT...
 *       says what time it is (seconds, UTC) and becomes PROGRAM
 *
 * The descriptors are the far ends of the handset's lines, inherited. The two sides take turns, so that a
 * change of the machine's speed hits both. Prints one JSON object; the floor's log goes where the environment
 * says, its progress texts to the file that FLOOR_OUTPUT names.
 */
#include <fcntl.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <string>
#include <thread>
#include <time.h>
#include <unistd.h>

#include "tests/bench/support/floor.h"
#include "tests/bench/support/lines.h"
#include "tests/bench/support/processor-time.h"
#include "tests/bench/support/samples.h"

namespace {

constexpr int WARM_UP_ROUNDS = 50;
constexpr unsigned SOCAT_START_US = 300000;

/* The floor writes its last records behind its last frame. */
constexpr unsigned FLOOR_END_US = 200000;

const std::string LINE = "\r\n+CSQ: 17,99\r\n";

/* A way from one descriptor to another, and the process on it. */
struct road_st
{
    pid_t m_pid;
    int m_out_fd;
    int m_in_fd;
    std::string m_request;
    size_t m_response_length;
};

/* A process and the line on which it is asked and answers. */
struct side_st
{
    pid_t m_pid;
    int m_fd;
};

/* What a road has been measured at. */
struct result_st
{
    sample_list m_sample_list;
    sample_list m_processor_list; /* a request's processor time, a turn each */
};

void measure_turn(const road_st &road, int rounds, result_st *result_ptr)
{
    const double before = get_processor_us(road.m_pid);
    for (int i = 0; i < rounds; i++) {
        const auto start = clock_type::now();
        write_whole(road.m_out_fd, road.m_request);
        read_whole(road.m_in_fd, road.m_response_length);
        result_ptr->m_sample_list.push_back(elapsed_us(start));
    }
    result_ptr->m_processor_list.push_back((get_processor_us(road.m_pid) - before) / rounds);
}

void print_result(const char *name, const result_st &result)
{
    const sample_list &samples = result.m_sample_list;
    printf("\"%s\": {\"median_us\": %.3f, \"p99_us\": %.3f, \"processor_us\": %.3f}, ", name,
           get_percentile(samples, 0.5), get_percentile(samples, 0.99),
           get_percentile(result.m_processor_list, 0.5));
}

/* Both roads in turn; a few rounds first that are not counted. */
void compare_roads(const road_st &daemon, const road_st &other, int rounds)
{
    result_st ours;
    result_st theirs;
    for (int turn = -1; turn < TURNS; turn++) {
        result_st warm_up;
        const int turn_rounds = turn < 0 ? WARM_UP_ROUNDS : rounds / TURNS;
        measure_turn(daemon, turn_rounds, turn < 0 ? &warm_up : &ours);
        measure_turn(other, turn_rounds, turn < 0 ? &warm_up : &theirs);
    }
    print_result("daemon", ours);
    print_result("other", theirs);
    printf("\"paired_ratio\": %.4f, \"processor_ratio\": %.4f",
           get_paired_ratio(ours.m_sample_list, theirs.m_sample_list),
           get_paired_ratio(ours.m_processor_list, theirs.m_processor_list));
}

/* The floor's progress texts go to a file, as the daemon's do. */
void redirect_output()
{
    const char *const path = getenv("FLOOR_OUTPUT");
    const int fd = path != nullptr ? open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0666) : -1;
    if (fd < 0 || dup2(fd, STDOUT_FILENO) != STDOUT_FILENO) {
        die("FLOOR_OUTPUT");
    }
}

void sleep_for_ever()
{
    for (;;) {
        pause();
    }
}

pid_t start_floor(const floor_st &floor, int line, int modem, int threads)
{
    const pid_t pid = fork_companion();
    if (pid == 0) {
        redirect_output();
        for (int i = 1; i < threads; i++) {
            std::thread(sleep_for_ever).detach();
        }
        run_floor(floor, line, modem);
    }
    return pid;
}

void end_floor(pid_t pid)
{
    usleep(FLOOR_END_US);
    end_companion(pid);
}

/* A line of the daemon's and one of the floor's, of processes that serve the same request; the floor ends. */
int compare_with_floor(const floor_st &floor, const side_st &daemon, const side_st &other, int rounds)
{
    printf("{\"records\": %u, ", floor.m_record_count);
    compare_roads({daemon.m_pid, daemon.m_fd, daemon.m_fd, floor.m_request, floor.m_response_length},
                  {other.m_pid, other.m_fd, other.m_fd, floor.m_request, floor.m_response_length}, rounds);
    printf("}\n");
    end_floor(other.m_pid);
    return 0;
}

int run_round_trip(char **argv)
{
    const int line_fd = atoi(argv[3]);
    const floor_st &floor = find_floor(argv[4]);
    make_blocking(line_fd);
    std::string path;
    const int floor_fd = open_pty(&path);
    const pid_t pid = start_floor(floor, open_slave(path), -1, atoi(argv[5]));
    return compare_with_floor(floor, {atoi(argv[2]), line_fd}, {pid, floor_fd}, atoi(argv[6]));
}

/* The daemon holds the master of the app's line, and the slave of the modem's. */
int run_tunnel(char **argv)
{
    const int app_fd = atoi(argv[3]);
    const int modem_fd = atoi(argv[4]);
    const floor_st &floor = find_floor("tunnel");
    make_blocking(app_fd);
    make_blocking(modem_fd);
    std::string path;
    const int master = open_pty(&path);
    const int floor_fd = open_slave(path);
    const pid_t pid = start_floor(floor, master, modem_fd, 1);
    return compare_with_floor(floor, {atoi(argv[2]), app_fd}, {pid, floor_fd}, atoi(argv[5]));
}

pid_t start_socat(const std::string &path_a, const std::string &path_b)
{
    const pid_t pid = fork_companion();
    if (pid == 0) {
        execlp("socat", "socat", (path_a + ",rawer").c_str(), (path_b + ",rawer").c_str(), nullptr);
        die("socat");
    }
    usleep(SOCAT_START_US);
    return pid;
}

/* Megabytes a second from one end to the other. The sender runs beside the receiver, as the lines hold
 * little. */
double measure_throughput(const road_st &road, size_t length)
{
    const std::string data(length, 'x');
    const auto start = clock_type::now();
    std::thread sender([&] { write_whole(road.m_out_fd, data); });
    read_whole(road.m_in_fd, length);
    sender.join();
    return static_cast<double>(length) / elapsed_us(start);
}

void compare_throughput(const road_st &daemon, const road_st &other, size_t length)
{
    sample_list ours;
    sample_list theirs;
    for (int turn = 0; turn < TURNS; turn++) {
        ours.push_back(measure_throughput(daemon, length / TURNS));
        theirs.push_back(measure_throughput(other, length / TURNS));
    }
    printf(", \"daemon_mb_s\": %.3f, \"other_mb_s\": %.3f", get_percentile(ours, 0.5),
           get_percentile(theirs, 0.5));
}

int run_pass_through(char **argv)
{
    const pid_t daemon_pid = atoi(argv[2]);
    const int pc_fd = atoi(argv[3]);
    const int modem_fd = atoi(argv[4]);
    const size_t length = strtoul(argv[5], nullptr, 10);
    const int rounds = atoi(argv[6]);
    make_blocking(pc_fd);
    make_blocking(modem_fd);
    std::string path_a[2];
    const int end_a[] = {open_pty(&path_a[0]), open_pty(&path_a[1])};
    const pid_t pid = start_socat(path_a[0], path_a[1]);
    const road_st to_pc = {daemon_pid, modem_fd, pc_fd, LINE, LINE.size()};
    const road_st to_modem = {daemon_pid, pc_fd, modem_fd, LINE, LINE.size()};
    const road_st there = {pid, end_a[0], end_a[1], LINE, LINE.size()};
    const road_st back = {pid, end_a[1], end_a[0], LINE, LINE.size()};
    printf("{\"to_pc\": {");
    compare_roads(to_pc, there, rounds);
    compare_throughput(to_pc, there, length);
    printf("}, \"to_modem\": {");
    compare_roads(to_modem, back, rounds);
    compare_throughput(to_modem, back, length);
    printf("}}\n");
    end_companion(pid);
    return 0;
}

int run_start(char **argv)
{
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    printf("%lld.%06ld\n", static_cast<long long>(now.tv_sec), now.tv_nsec / 1000);
    fflush(stdout);
    execv(argv[2], argv + 2);
    die(argv[2]);
}

} // namespace

int main(int argc, char **argv)
{
    const std::string what = argc > 2 ? argv[1] : "";
    if (what == "round-trip" && argc == 7) {
        return run_round_trip(argv);
    }
    if (what == "tunnel" && argc == 6) {
        return run_tunnel(argv);
    }
    if (what == "pass-through" && argc == 7) {
        return run_pass_through(argv);
    }
    if (what == "start") {
        return run_start(argv);
    }
    fprintf(stderr, "usage: the head of tests/bench/link-bench.cpp\n");
    return 2;
}
