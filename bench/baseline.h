// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// How a baseline logs: as the library does, after a prefix of the same form.
#pragma once

#include "vr_log.h"

#include <unistd.h>

#define BASELINE_LOG(format, ...)                                                                  \
    vr_log_printf(VR_LOG_DEBUG, "VRCODE", "%-15s:%04d:pid=%d:ctid=%d => " format, "baseline",      \
                  __LINE__, (int)getpid(), (int)gettid() __VA_OPT__(, ) __VA_ARGS__)
