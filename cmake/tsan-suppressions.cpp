/*
 * What ThreadSanitizer must not report, linked into the programs of its build only.
 *
 * The end of the process waits a bounded time for a worker that is busy, and then closes its line under it: a
 * shell command may take for ever, and the process is gone a moment later.
 */
extern "C" const char *__tsan_default_suppressions();

extern "C" const char *__tsan_default_suppressions()
{
    return "race:amt_handle_close_fd\n"
           "race:pub_pty_close\n";
}
