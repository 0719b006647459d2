/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/* The platform's socket wrappers. */
#ifndef VORLANE_SOCKWRAP_H
#define VORLANE_SOCKWRAP_H

#include <sys/socket.h>

#ifdef __cplusplus
extern "C" {
#endif

/*
 * Sets the address-reuse option of a socket to *value, so that a port can be
 * bound again at once after its last listener was closed.
 */
void Setsockopt(int descriptor, const int *value);

/* Binds a socket to an address of the given length in bytes. */
void Bind(int descriptor, const struct sockaddr *address, socklen_t length);

/*
 * Waits for a connection, without a time limit. address receives the peer's
 * address; *length is its capacity in bytes before, its size after.
 *
 * Returns the descriptor of the connection, which the caller owns, or a
 * negative value with errno set.
 */
int Accept(int descriptor, struct sockaddr *address, socklen_t *length);

#ifdef __cplusplus
}
#endif

#endif
