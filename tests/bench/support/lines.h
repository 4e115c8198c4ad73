#pragma once

#include <stddef.h>
#include <string>
#include <sys/types.h>

/* Lines and the bytes on them, for the benchmark programs: whatever fails ends the program with a message. */

[[noreturn]] void die(const char *what);

/* The whole of it, however many writes that takes. */
void write_whole(int fd, const char *data, size_t length);
void write_whole(int fd, const std::string &data);

/* Waits for length bytes, at most five seconds for each piece. */
void read_whole(int fd, size_t length);

void make_blocking(int fd);

/* A raw pseudo-terminal. Returns the master; the slave's path goes to *path_ptr. */
int open_pty(std::string *path_ptr);

/* The slave of a pseudo-terminal, opened like a tty of the handset's. */
int open_slave(const std::string &path);

/* Forks; the child dies with its parent. */
pid_t fork_companion();

void end_companion(pid_t pid);
