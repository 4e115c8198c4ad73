#pragma once

#include <sys/types.h>

/*
 * Sees to it that the child leaves no zombie, and never waits for it itself: a detached thread of its own
 * waits for this one child, logs the signal that has ended it, if any, and ends with it. The disposition of
 * SIGCHLD is not touched, and no other child is waited for, so system() keeps working on every thread.
 *
 * Where no thread is to be had, the child is noted, and asked for at each later call. Calls come from one
 * thread at a time.
 */
void amt_child_reap(pid_t child_pid);

/*
 * Called in a child right after fork: it is killed as soon as its parent (more exactly the parent's thread
 * that forked it) ends, also when that has happened already. parent_pid is the parent's id, taken before the
 * fork.
 */
void amt_child_die_with(pid_t parent_pid);
