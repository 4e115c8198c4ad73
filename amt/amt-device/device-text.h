#pragma once

#include <stdint.h>

#include "amt/amt-buf.h"

/*
 * Takes the text of a string atom into dst, always terminated: at most capacity - 1 characters, the rest is
 * cut. dst is zeroed first. Returns the characters taken, 0 for a missing atom; the text may hold zero bytes
 * of its own.
 */
uint32_t amt_device_get_text(const amt_buf_st *req_ptr, uint8_t atom_id, char *dst, uint32_t capacity);
