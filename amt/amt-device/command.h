#pragma once

/*
 * Runs a shell command, at once again when it fails, five times at most. Logs every failed attempt, or that
 * it succeeded. Returns 0, or -100 after the fifth failure.
 */
int amt_device_do_command(const char *command);

/* Runs a shell command once, where what comes of it changes nothing: debug traces, file modes. */
void amt_device_run(const char *command);
