// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The bytes that are allocated now, as they were asked for.
long memory_in_use();
