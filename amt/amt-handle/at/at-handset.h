#pragma once

/*
 * AT commands on the handset as a whole. operands is the request's text behind the command; each returns the
 * status of its reply.
 */
int amt_at_read_sw_version(const char *operands);
int amt_at_power_off(const char *operands);
int amt_at_enter_idle(const char *operands);
int amt_at_read_boot_dl_fin(const char *operands);
int amt_at_read_emmc_info(const char *operands);
