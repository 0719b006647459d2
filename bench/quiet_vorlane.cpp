// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "quiet_vorlane.h"

#include "sockwrap.h"
#include "vr_log.h"

static void (*g_Listener)(const char *format, va_list arguments);
static void (*g_Client)();

void quiet_on_log(void (*listener)(const char *format, va_list arguments))
{
    g_Listener = listener;
}

void quiet_on_accept(void (*client)())
{
    g_Client = client;
}

int vr_log_printf(int /* priority */, const char * /* tag */, const char *format, ...)
{
    if (g_Listener != nullptr) {
        va_list arguments;
        va_start(arguments, format);
        g_Listener(format, arguments);
        va_end(arguments);
    }
    return 0;
}

// The Linux wrapper, which is compiled under this name here.
extern "C" int linux_Accept(int descriptor, struct sockaddr *address, socklen_t *length);

int Accept(int descriptor, struct sockaddr *address, socklen_t *length)
{
    if (g_Client != nullptr) {
        g_Client();
    }
    return linux_Accept(descriptor, address, length);
}
