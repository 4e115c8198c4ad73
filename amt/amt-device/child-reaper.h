#pragma once

#include <sys/types.h>

/*
 * Sees to it that the child leaves no zombie: a detached thread of its own waits for this one child and ends
 * with it. The disposition of SIGCHLD is not touched, and no other child is waited for, so system() keeps
 * working on every thread. Without a thread to be had, the caller itself waits for the child's end.
 */
void amt_child_reap(pid_t child_pid);

/*
 * Called in a child right after fork: it is killed as soon as its parent (more exactly the parent's thread
 * that forked it) ends, also when that has happened already. parent_pid is the parent's id, taken before the
 * fork.
 */
void amt_child_die_with(pid_t parent_pid);
