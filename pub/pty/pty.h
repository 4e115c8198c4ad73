#pragma once

#include <stdint.h>

/*
 * A pseudo-terminal whose slave side is published under a fixed path by a symbolic link. The owner sets the
 * mapping name and m_is_nonblock before opening; the rest belongs to the operations below.
 */
struct pub_pty_st
{
    int32_t m_ptm_fd;              /* master; -1 when closed, 0 before first use */
    char m_pts_name_a[40];         /* slave device, as the kernel reports it */
    char m_pts_mapping_name_a[28]; /* path of the published link; kept over a close */
    uint8_t m_is_nonblock;         /* non-zero: the master is switched to non-blocking mode */
};

/*
 * Opens a new pseudo-terminal, publishes its slave (mode 0660, the system user, the radio group) and makes
 * the line raw. A channel that is open is closed first; whatever lies at the mapping path is replaced.
 *
 * Returns PUB_ERR_NONE; PUB_ERR_FILE when a step fails; PUB_ERR_PARAM for an absent channel or an empty
 * mapping name. After a failure neither link nor descriptor is left, unless what lies at the mapping path
 * cannot be removed.
 */
int pub_pty_open(pub_pty_st *pty_ptr);

/*
 * Removes the link, closes the master and sets m_ptm_fd to -1.
 *
 * Returns PUB_ERR_NONE; the status of pub_pty_delete_mapping when that fails, with the master still open;
 * PUB_ERR_SYS_CALL for an absent channel or one that is closed.
 */
int pub_pty_close(pub_pty_st *pty_ptr);

/*
 * Removes the published link.
 *
 * Returns PUB_ERR_NONE, also when there is none; PUB_ERR_FILE when it cannot be removed; PUB_ERR_PARAM for an
 * absent channel.
 */
int pub_pty_delete_mapping(pub_pty_st *pty_ptr);

/*
 * Step of pub_pty_open: names the slave of the open master and publishes it. Undoes nothing when it fails.
 *
 * Returns PUB_ERR_NONE, PUB_ERR_FILE, or PUB_ERR_PARAM for an absent channel, a closed one or an empty
 * mapping name.
 */
int create_pts_mapping(pub_pty_st *pty_ptr);

/*
 * Step of pub_pty_open: makes the line of this master raw and unlocks its slave.
 *
 * Returns PUB_ERR_NONE or PUB_ERR_FILE.
 */
int set_ptm_attr(int fd);
