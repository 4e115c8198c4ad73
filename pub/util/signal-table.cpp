#include "pub/util/signal-table.h"

const pub_util_signal_st pub_util_signal_table[] = {
    {1, "SIGHUP", 'T', "Hangup (POSIX)."},
    {2, "SIGINT", 'T', "Terminal interrupt signal (ANSI)."},
    {3, "SIGQUIT", 'A', "Terminal quit signal (POSIX)."},
    {4, "SIGILL", 'A', "Illegal instruction (ANSI)."},
    {5, "SIGTRAP", 'A', "Trace/breakpoint trap (POSIX)."},
    {6, "SIGABRT", 'A', "Process abort signal (ANSI)."},
    {6, "SIGIOT", 'A', "IOT trap (4.2 BSD)."},
    {7, "SIGBUS", 'A', "Access to an undefined portion of a memory object (4.2 BSD)."},
    {8, "SIGFPE", 'A', "Erroneous arithmetic operation (ANSI)."},
    {9, "SIGKILL", 'T', "Kill (cannot be caught or ignored) (POSIX)."},
    {10, "SIGUSR1", 'T', "User-defined signal 1 (POSIX)."},
    {11, "SIGSEGV", 'A', "Invalid memory reference (ANSI)."},
    {12, "SIGUSR2", 'T', "User-defined signal 2 (POSIX)."},
    {13, "SIGPIPE", 'T', "Write on a pipe with no one to read it (POSIX)."},
    {14, "SIGALRM", 'T', "Alarm clock (POSIX)."},
    {15, "SIGTERM", 'T', "Termination signal (ANSI)."},
    {16, "SIGSTKFLT", '?', "Stack fault"},
    {17, "SIGCHLD", 'I', "Child process terminated, stopped (POSIX)."},
    {18, "SIGCONT", 'C', "Continue executing, if stopped (POSIX)."},
    {19, "SIGSTOP", 'S', "Stop executing (cannot be caught or ignored) (POSIX)."},
    {20, "SIGTSTP", 'S', "Terminal stop signal (POSIX)."},
    {21, "SIGTTIN", 'S', "Background process attempting read (POSIX)."},
    {22, "SIGTTOU", 'S', "Background process attempting write (POSIX)."},
    {23, "SIGURG", 'I', "High bandwidth data is available at a socket (4.2 BSD)."},
    {24, "SIGXCPU", 'A', "CPU time limit exceeded (4.2 BSD)."},
    {25, "SIGXFSZ", 'A', "File size limit exceeded (4.2 BSD)."},
    {26, "SIGVTALRM", 'T', "Virtual timer expired (4.2 BSD)."},
    {27, "SIGPROF", 'T', "Profiling timer expired (4.2 BSD)."},
    {28, "SIGWINCH", '?', "Window size change (4.3 BSD, Sun)."},
    {29, "SIGPOLL", 'T', "Pollable event (System V)."},
    {29, "SIGIO", 'T', "I/O now possible (4.2 BSD)."},
    {30, "SIGPWR", '?', "Power failure restart (System V)."},
    {31, "SIGSYS", 'A', "Bad system call."},
    {0xFFFF, nullptr, '?', nullptr},
};

const char *pub_util_get_signal_name(int signal_number)
{
    for (const pub_util_signal_st *row = pub_util_signal_table; row->m_name_ptr != nullptr; row++) {
        if (row->m_number == signal_number) {
            return row->m_name_ptr;
        }
    }
    return "";
}

sigset_t pub_util_get_signal_set(std::initializer_list<int> signal_list)
{
    sigset_t set;
    sigemptyset(&set);
    for (const int signal_number : signal_list) {
        sigaddset(&set, signal_number);
    }
    return set;
}
