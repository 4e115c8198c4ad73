#pragma once

#include <stdint.h>
#include <vector>

/*
 * The platform's radio test library in a target: each call takes the next of these statuses, and 0 behind the last;
 * what it gives back is the number of the call.
 */
void scripted_ldt_set(const std::vector<int8_t> &statuses);
