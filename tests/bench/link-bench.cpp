/*
 * What the daemon costs on the wire, beside what the wire costs by itself.
 *
 *   link-bench round-trip PC_FD REQUEST_HEX RESPONSE_HEX[,RESPONSE_HEX] ROUNDS
 *       request to whole response over the PC line, against a bare process that answers the same bytes,
 *       frame by frame, on a pseudo-terminal of its own
 *   link-bench pass-through PC_FD MODEM_FD BYTES ROUNDS
 *       BYTES bytes from the modem line to the PC line as fast as they go, and ROUNDS single lines in each
 *       direction, against socat between two pseudo-terminals
 *   link-bench exchange APP_FD REQUEST_HEX LENGTH BARE_FD BARE_REQUEST_HEX BARE_LENGTH ROUNDS
 *       a request over the app line that the modem answers, against the bare exchange with the same modem
 *
 * The descriptors are the far (master) ends of the handset's lines, inherited. The two sides take turns, so
 * that a change of the machine's speed hits both. Prints one JSON object.
 */
#include <algorithm>
#include <chrono>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <stddef.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <string>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <termios.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace {

using clock_type = std::chrono::steady_clock;
using sample_list = std::vector<double>;

constexpr int TURNS = 50;
constexpr int WARM_UP_ROUNDS = 50;
constexpr int ANSWER_TIMEOUT_MS = 5000;

[[noreturn]] void die(const char *what)
{
    fprintf(stderr, "link-bench: %s: %s\n", what, strerror(errno));
    exit(1);
}

double elapsed_us(clock_type::time_point start)
{
    return std::chrono::duration<double, std::micro>(clock_type::now() - start).count();
}

std::string from_hex(const char *hex)
{
    std::string bytes;
    for (const char *pair = hex; pair[0] != '\0' && pair[1] != '\0'; pair += 2) {
        bytes.push_back(static_cast<char>(strtol(std::string(pair, 2).c_str(), nullptr, 16)));
    }
    return bytes;
}

void write_whole(int fd, const char *data, size_t length)
{
    while (length > 0) {
        const ssize_t written = write(fd, data, length);
        if (written <= 0) {
            die("write");
        }
        data += written;
        length -= static_cast<size_t>(written);
    }
}

void read_whole(int fd, size_t length)
{
    char buf_a[65536];
    while (length > 0) {
        pollfd poll_fd = {fd, POLLIN, 0};
        if (poll(&poll_fd, 1, ANSWER_TIMEOUT_MS) != 1) {
            errno = ETIMEDOUT;
            die("no answer");
        }
        const ssize_t count = read(fd, buf_a, std::min(sizeof(buf_a), length));
        if (count <= 0) {
            die("read");
        }
        length -= static_cast<size_t>(count);
    }
}

void make_blocking(int fd)
{
    fcntl(fd, F_SETFL, fcntl(fd, F_GETFL) & ~O_NONBLOCK);
}

/* A pseudo-terminal of our own, raw. Returns the master; the slave's path goes to *path_ptr. */
int open_pty(std::string *path_ptr)
{
    const int master = posix_openpt(O_RDWR | O_NOCTTY | O_CLOEXEC);
    if (master < 0 || grantpt(master) != 0 || unlockpt(master) != 0) {
        die("pseudo-terminal");
    }
    *path_ptr = ptsname(master);
    termios attr = {};
    tcgetattr(master, &attr);
    cfmakeraw(&attr);
    tcsetattr(master, TCSANOW, &attr);
    return master;
}

void end_child(pid_t pid)
{
    kill(pid, SIGKILL);
    waitpid(pid, nullptr, 0);
}

using frame_list = std::vector<std::string>;

/* Frames in hexadecimal, separated by commas. */
frame_list split_frames(const std::string &text)
{
    frame_list frames;
    size_t start = 0;
    for (size_t comma = text.find(','); comma != std::string::npos; comma = text.find(',', start)) {
        frames.push_back(from_hex(text.substr(start, comma - start).c_str()));
        start = comma + 1;
    }
    frames.push_back(from_hex(text.substr(start).c_str()));
    return frames;
}

/* The bare process: reads a request, writes the response's frames, nothing else. */
[[noreturn]] void answer_for_ever(int fd, size_t request_length, const frame_list &response)
{
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    for (;;) {
        read_whole(fd, request_length);
        for (const std::string &frame : response) {
            write_whole(fd, frame.data(), frame.size());
        }
    }
}

pid_t start_bare_answerer(const std::string &path, size_t request_length, const frame_list &response)
{
    const int slave = open(path.c_str(), O_RDWR | O_NOCTTY);
    const pid_t pid = fork();
    if (pid == 0) {
        answer_for_ever(slave, request_length, response);
    }
    close(slave);
    return pid;
}

pid_t start_socat(const std::string &path_a, const std::string &path_b)
{
    const pid_t pid = fork();
    if (pid == 0) {
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        execlp("socat", "socat", (path_a + ",rawer").c_str(), (path_b + ",rawer").c_str(), nullptr);
        die("socat");
    }
    return pid;
}

void measure_rounds(int out_fd, const std::string &request, int in_fd, size_t length, int rounds,
                    sample_list *out_ptr)
{
    for (int i = 0; i < rounds; i++) {
        const auto start = clock_type::now();
        write_whole(out_fd, request.data(), request.size());
        read_whole(in_fd, length);
        out_ptr->push_back(elapsed_us(start));
    }
}

double get_percentile(sample_list samples, double part)
{
    std::sort(samples.begin(), samples.end());
    return samples[static_cast<size_t>(part * static_cast<double>(samples.size() - 1))];
}

sample_list get_turn_medians(const sample_list &samples)
{
    const size_t turn_size = samples.size() / TURNS;
    sample_list medians;
    for (size_t start = 0; start + turn_size <= samples.size(); start += turn_size) {
        const auto first = samples.begin() + static_cast<ptrdiff_t>(start);
        medians.push_back(get_percentile(sample_list(first, first + static_cast<ptrdiff_t>(turn_size)), 0.5));
    }
    return medians;
}

/* The median, over all turns, of one side's median over the other's in the same turn. */
double get_paired_ratio(const sample_list &ours, const sample_list &theirs)
{
    sample_list ratios = get_turn_medians(ours);
    const sample_list their_medians = get_turn_medians(theirs);
    for (size_t i = 0; i < ratios.size(); i++) {
        ratios[i] /= their_medians[i];
    }
    return get_percentile(ratios, 0.5);
}

void print_samples(const char *name, const sample_list &samples)
{
    printf("\"%s\": {\"median_us\": %.2f, \"p99_us\": %.2f, \"rounds\": %zu}", name,
           get_percentile(samples, 0.5), get_percentile(samples, 0.99), samples.size());
}

struct road_st
{
    int m_out_fd;
    int m_in_fd;
    std::string m_request;
    size_t m_response_length;
};

/* Both roads in turn; a few rounds first that are not counted. */
void compare_roads(const char *name, const road_st &daemon, const char *bare_name, const road_st &bare,
                   int rounds)
{
    sample_list samples_a[2];
    const road_st *const road_a[] = {&daemon, &bare};
    for (int turn = -1; turn < TURNS; turn++) {
        for (int i = 0; i < 2; i++) {
            sample_list warm_up;
            measure_rounds(road_a[i]->m_out_fd, road_a[i]->m_request, road_a[i]->m_in_fd,
                           road_a[i]->m_response_length, turn < 0 ? WARM_UP_ROUNDS : rounds / TURNS,
                           turn < 0 ? &warm_up : &samples_a[i]);
        }
    }
    print_samples(name, samples_a[0]);
    printf(", ");
    print_samples(bare_name, samples_a[1]);
    printf(", \"paired_ratio\": %.3f", get_paired_ratio(samples_a[0], samples_a[1]));
}

/* Megabytes a second from one end to the other. The sender runs beside the receiver, as the lines hold
 * little. */
double measure_throughput(int out_fd, int in_fd, size_t length)
{
    const std::string data(length, 'x');
    const auto start = clock_type::now();
    std::thread sender([&] { write_whole(out_fd, data.data(), data.size()); });
    read_whole(in_fd, length);
    sender.join();
    return static_cast<double>(length) / elapsed_us(start);
}

int run_round_trip(char **argv)
{
    const int pc_fd = atoi(argv[2]);
    const std::string request = from_hex(argv[3]);
    const frame_list response = split_frames(argv[4]);
    size_t response_length = 0;
    for (const std::string &frame : response) {
        response_length += frame.size();
    }
    make_blocking(pc_fd);
    std::string path;
    const int bare_fd = open_pty(&path);
    const pid_t pid = start_bare_answerer(path, request.size(), response);
    printf("{");
    compare_roads("daemon", {pc_fd, pc_fd, request, response_length}, "bare",
                  {bare_fd, bare_fd, request, response_length}, atoi(argv[5]));
    printf("}\n");
    end_child(pid);
    return 0;
}

void print_throughput(const char *name, const int *daemon_fd_a, const int *socat_fd_a, size_t length)
{
    sample_list rate_a[2];
    for (int turn = 0; turn < TURNS; turn++) {
        rate_a[0].push_back(measure_throughput(daemon_fd_a[0], daemon_fd_a[1], length / TURNS));
        rate_a[1].push_back(measure_throughput(socat_fd_a[0], socat_fd_a[1], length / TURNS));
    }
    printf("\"%s\": {\"daemon_mb_s\": %.2f, \"socat_mb_s\": %.2f}, ", name, get_percentile(rate_a[0], 0.5),
           get_percentile(rate_a[1], 0.5));
}

int run_pass_through(char **argv)
{
    const int daemon_fd_a[] = {atoi(argv[3]), atoi(argv[2])};
    make_blocking(daemon_fd_a[0]);
    make_blocking(daemon_fd_a[1]);
    std::string path_a[2];
    const int socat_fd_a[] = {open_pty(&path_a[0]), open_pty(&path_a[1])};
    const pid_t pid = start_socat(path_a[0], path_a[1]);
    usleep(300000);
    const std::string line = "\r\n+CSQ: 17,99\r\n";
    printf("{");
    print_throughput("from_modem", daemon_fd_a, socat_fd_a, strtoul(argv[4], nullptr, 10));
    compare_roads("daemon", {daemon_fd_a[0], daemon_fd_a[1], line, line.size()}, "socat",
                  {socat_fd_a[0], socat_fd_a[1], line, line.size()}, atoi(argv[5]));
    printf(", \"to_modem\": {");
    compare_roads("daemon", {daemon_fd_a[1], daemon_fd_a[0], line, line.size()}, "socat",
                  {socat_fd_a[1], socat_fd_a[0], line, line.size()}, atoi(argv[5]));
    printf("}}\n");
    end_child(pid);
    return 0;
}

int run_exchange(char **argv)
{
    const int app_fd = atoi(argv[2]);
    const int bare_fd = atoi(argv[5]);
    make_blocking(app_fd);
    make_blocking(bare_fd);
    printf("{");
    compare_roads("daemon", {app_fd, app_fd, from_hex(argv[3]), strtoul(argv[4], nullptr, 10)}, "bare",
                  {bare_fd, bare_fd, from_hex(argv[6]), strtoul(argv[7], nullptr, 10)}, atoi(argv[8]));
    printf("}\n");
    return 0;
}

} // namespace

int main(int argc, char **argv)
{
    if (argc == 6 && strcmp(argv[1], "round-trip") == 0) {
        return run_round_trip(argv);
    }
    if (argc == 6 && strcmp(argv[1], "pass-through") == 0) {
        return run_pass_through(argv);
    }
    if (argc == 9 && strcmp(argv[1], "exchange") == 0) {
        return run_exchange(argv);
    }
    fprintf(stderr, "usage: the head of tests/bench/link-bench.cpp\n");
    return 2;
}
