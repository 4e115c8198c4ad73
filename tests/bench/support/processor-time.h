#pragma once

#include <sys/types.h>

/*
 * The time that all threads of a process have had a processor for, in microseconds: the scheduler's own
 * account. Ends the program when the process is not there or the kernel keeps no account.
 */
double get_processor_us(pid_t pid);
