#pragma once

/*
 * The creation of threads in these tests: every pthread_create() of theirs, and of what they test, is made
 * here, and may be refused or kept from returning.
 */

/* While it lives, no thread is to be had. */
class no_threads_c {
public:
    no_threads_c();
    ~no_threads_c();
    no_threads_c(const no_threads_c &) = delete;
    no_threads_c &operator=(const no_threads_c &) = delete;
};

/* What the calling thread's next creation calls, on that thread, when the new one may run already. */
void thread_creation_pause_once(void (*pause)());
