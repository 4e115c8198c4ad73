#include <errno.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include "amt/amt-cfg.h"
#include "amt/amt-handle/channel/context.h"
#include "amt/amt-handle/channel/process-end.h"
#include "amt/amt-handle/channel/worker.h"
#include "amt/amt-handle/startup.h"
#include "amt/amt-log.h"
#include "amt/signal-treatment.h"
#include "pub/error.h"
#include "pub/log/print.h"
#include "pub/util/process.h"

namespace {

constexpr char PROGRAM[] = "vx-kel-amt";
constexpr char VERSION[] = "001.001";
constexpr char NORMAL_MODE_TEXT[] = "normal mode(with KEL platform)";
constexpr char SIMPLIFIED_MODE_TEXT[] = "simplified mode(only with kernel)";

/* The line numbers that the texts of main show: whoever reads the log knows the places by them. */
constexpr int USAGE_LINE = 238;
constexpr int FATAL_LINE = 429;

constexpr int MODE_NORMAL = 1;
constexpr int MODE_SIMPLIFIED = 0;

constexpr uint32_t PATH_SIZE = 60;
constexpr uint32_t PROCESS_PATH_SIZE = 256;

struct run_mode_st
{
    int m_mode;
    const char *m_text_ptr;
};

amt_worker_st g_starter;

int g_argument_count = 0;
char **g_argument_ptr = nullptr;

char g_cfg_path_a[PATH_SIZE];
char g_pid_path_a[PATH_SIZE];

/* Prints the usage and returns the exit status. */
int prompt_usage(const char *own_name)
{
    if (own_name == nullptr) {
        pub_print("%s(L%d)invalid parameter\n", __func__, USAGE_LINE);
        return PUB_ERR_SYS_CALL;
    }
    pub_print("\nUsage: %s [OPTION]\n"
              "  -h                     Display this help and exit.\n"
              "  -u                     For usb-insert-enter-amt.\n\n",
              own_name);
    return PUB_ERR_NONE;
}

/* Whether the start goes on; otherwise *exit_status_ptr is set. */
bool parse_options(int argc, char **argv, int *exit_status_ptr)
{
    if (argc <= 1) {
        return true;
    }
    for (int option = getopt(argc, argv, "h:u"); option != -1; option = getopt(argc, argv, "h:u")) {
        if (option != 'u') {
            *exit_status_ptr = prompt_usage(argv[0]);
            return false;
        }
        g_usb_activate = 1;
    }
    return true;
}

void set_paths(const char *cfg_folder, const char *pid_folder)
{
    memset(g_cfg_path_a, 0, sizeof(g_cfg_path_a));
    memset(g_pid_path_a, 0, sizeof(g_pid_path_a));
    snprintf(g_cfg_path_a, sizeof(g_cfg_path_a), "%s/%s.cfg", cfg_folder, PROGRAM);
    snprintf(g_pid_path_a, sizeof(g_pid_path_a), "%s/%s.pid", pid_folder, PROGRAM);
}

run_mode_st choose_mode_and_paths()
{
    if (g_usb_activate != 0) {
        set_paths("/system/etc", "/tmp");
        return {MODE_SIMPLIFIED, SIMPLIFIED_MODE_TEXT};
    }
    char process_path_a[PROCESS_PATH_SIZE] = {};
    pub_util_get_process_path(process_path_a, sizeof(process_path_a));
    pub_print("[%s]command path is \"%s\"\n", PROGRAM, process_path_a);
    const bool is_normal = strstr(process_path_a, "/system/bin") != nullptr;
    const char *const text = is_normal ? NORMAL_MODE_TEXT : SIMPLIFIED_MODE_TEXT;
    pub_print("[%s]run under %s \n", PROGRAM, text);
    set_paths(is_normal ? "/system/etc" : process_path_a, is_normal ? "/tmp" : process_path_a);
    return {is_normal ? MODE_NORMAL : MODE_SIMPLIFIED, text};
}

bool is_already_running()
{
    int32_t is_running = 0;
    int32_t pid = 0;
    pub_util_get_pid_and_check_run(g_pid_path_a, PROGRAM, &is_running, &pid);
    return is_running != 0;
}

void log_banner()
{
    PUB_LOG(g_amt_main_log, "%s", "");
    PUB_LOG(g_amt_main_log, "    %s, version %s", PROGRAM, VERSION);
    PUB_LOG(g_amt_main_log, "    Build time: %s %s", __DATE__, __TIME__);
}

int start(int mode)
{
    const int cfg_status = amt_cfg_init(g_cfg_path_a);
    pub_print("[%s]config over result=%d\n", PROGRAM, cfg_status);
    if (cfg_status != PUB_ERR_NONE) {
        return cfg_status;
    }
    const int init_status = amt_handle_init(mode);
    if (init_status != PUB_ERR_NONE) {
        amt_signal_settle(); /* a refused handshake ends the process by a signal, not by its status */
    }
    pub_print("[%s]init over result=%d\"\n", PROGRAM, init_status);
    return init_status;
}

[[noreturn]] void end_by_fatal_error(int error_code)
{
    amt_process_end_begin(error_code);
    PUB_LOG(g_amt_main_log, "FATAL ERROR!!!");
    pub_log_error({g_amt_main_log, "main", FATAL_LINE}, error_code);
    amt_deinit_resource();
    amt_process_end_finish();
}

/* Everything up to the running hub, on the starter. Returns when the hub runs. */
void start_up()
{
    /* A shell command has SIGINT ignored: it must not begin before the main thread waits for its signals. */
    amt_signal_await_taker();
    int exit_status = 0;
    if (!parse_options(g_argument_count, g_argument_ptr, &exit_status)) {
        _exit(exit_status);
    }
    pub_print("g_usb_activate:%d.\n", g_usb_activate);
    const run_mode_st mode = choose_mode_and_paths();
    pub_print("[%s]config file is \"%s\"\n            pid file is \"%s\"\n", PROGRAM, g_cfg_path_a,
              g_pid_path_a);
    if (is_already_running()) {
        pub_print("%s already run.\n", PROGRAM);
        _exit(0);
    }
    log_banner();
    pub_util_create_pid_file(PROGRAM);
    PUB_LOG(g_amt_main_log, "run under %s", mode.m_text_ptr);
    PUB_LOG(g_amt_main_log, "config file[%s], pid file[%s]", g_cfg_path_a, g_pid_path_a);
    pub_util_raise_process_priority();
    const int status = start(mode.m_mode);
    if (status != PUB_ERR_NONE) {
        end_by_fatal_error(status);
    }
}

} // namespace

int main(int argc, char **argv)
{
    amt_signal_prepare();
    amt_process_end_set_shut_down(amt_handle_deinit);
    g_usb_activate = 0;
    g_argument_count = argc;
    g_argument_ptr = argv;
    const int error = amt_worker_start(&g_starter, start_up);
    if (error != 0) {
        errno = error;
        end_by_fatal_error(PUB_ERR_FILE);
    }
    amt_signal_take(&g_starter);
}
