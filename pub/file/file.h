#pragma once

#include <stdint.h>
#include <stdio.h>

/*
 * Small text files: opened, read or written, and closed by themselves. No program the process starts inherits
 * them. Nothing here logs: what a failure is called is the caller's business, and errno is the failing call's
 * when an operation returns, whatever closing the file does to it.
 *
 * The end of a worker thread runs no destructors. It strikes in waits only (pub/util/thread-end.h), so a file
 * must not be open across one.
 */

enum class pub_file_mode_en : uint8_t
{
    READ,
    WRITE,  /* emptied, or made */
    UPDATE, /* read and written in place; must be there */
    RENEW   /* emptied, or made; can be read too */
};

/* A file, open as long as the object lives or until pub_file_close. */
struct pub_file_st
{
    pub_file_st(const char *path, pub_file_mode_en mode);
    ~pub_file_st();
    pub_file_st(const pub_file_st &) = delete;
    pub_file_st &operator=(const pub_file_st &) = delete;

    bool is_open() const
    {
        return m_stream_ptr != nullptr;
    }

    FILE *m_stream_ptr; /* null: not open */
};

/* Opens another file with the object. Requires that it is not open. */
void pub_file_open(pub_file_st *file_ptr, const char *path, pub_file_mode_en mode);

/* Closes the file before the object goes, for what must happen to a closed file. Preserves errno. */
void pub_file_close(pub_file_st *file_ptr);

/*
 * Reads the next line, its line feed included, into line_ptr (size bytes), terminated. A line that does not
 * fit comes in pieces of size - 1 characters. Returns its length in bytes, zero bytes within the line
 * included; 0 at the end of the file (errno is then 0) or after a failed read. Requires an open file and a
 * size of at least 2.
 */
uint32_t pub_file_get_line(const pub_file_st &file, char *line_ptr, uint32_t size);

/*
 * Writes the text and the line end as they stand, to the system and not only to the stream: a full file
 * system or a driver's refusal shows here. Returns whether all of it was taken. Requires an open file.
 */
bool pub_file_put(const pub_file_st &file, const char *text, const char *line_end = "");

/* How far the reading or writing of a whole file came. */
enum class pub_file_step_en : uint8_t
{
    DONE,
    OPEN_FAILED,
    READ_FAILED, /* unreadable, or nothing to read: then errno is 0 */
    WRITE_FAILED /* the file may hold a part */
};

/*
 * Reads the first line of the file at path, as pub_file_get_line does; *line_ptr is empty when the result is
 * not DONE.
 */
pub_file_step_en pub_file_read_line(const char *path, char *line_ptr, uint32_t size);

/* The same for the first word, as pub_file_scan_word (pub/file/scan.h) reads it. */
pub_file_step_en pub_file_read_word(const char *path, char *word_ptr, uint32_t size);

/* Writes a file that holds the text, the line end and nothing else, in mode RENEW. */
pub_file_step_en pub_file_write(const char *path, const char *text, const char *line_end = "");
