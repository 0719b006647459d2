// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// The platform's library as it is for measuring: the log drops what it gets, and
// what the bench wants to hear of can be listened to. The rest is as shipped.
#pragma once

#include <cstdarg>

// Gets every log call from then on, in place of nobody; null: nobody again.
void quiet_on_log(void (*listener)(const char *format, va_list arguments));

// Is called whenever a server is about to accept, so that a client can connect
// at that moment; null: no client.
void quiet_on_accept(void (*client)());
