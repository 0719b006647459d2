# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What shared libraries say of themselves, and libraries of a device's platform."""
import re

from support.outside import TREE, output_of

# What the library exports, on whatever it is built.
INTERFACE = ["FPTEST_ExtractResultMsg", "FPTEST_RunTestCmd", "FPTEST_SetTransation",
             "FPTEST_SuspendItemExecute", "g_TestCmdTree"]

# They do nothing.
PLATFORM = {
    "platform": """
#include "mxml_whitespace.h"
#include "sockwrap.h"
#include "sysparm.h"
void mxmlSetLoneWhitespaceOff(int off) {}
void Setsockopt(int d, const int *v) {}
void Bind(int d, const struct sockaddr *a, socklen_t l) {}
int Accept(int d, struct sockaddr *a, socklen_t *l) { return -1; }
int get_node_value(const char *f, const char *p, char *b, size_t l) { return -1; }
""",
    "platformlog": """
#include "vr_log.h"
int vr_log_printf(int p, const char *t, const char *f, ...) { return 0; }
"""}


def exports_of(library):
    """The names that others find in it, sorted."""
    listing = output_of("nm", "--dynamic", "--defined-only", library)
    return sorted(line.split()[-1] for line in listing.splitlines())


def entries_of(library, kind):
    """The entries of that kind of its dynamic section, sorted."""
    listing = output_of("readelf", "--dynamic", "--wide", library)
    return sorted(re.findall(rf"\({kind}\).*\[(.*)\]", listing))


def make_platform_libraries(directory):
    """Makes them in the directory, and gives them as a list of CMake's."""
    libraries = []
    for name, text in PLATFORM.items():
        source, library = directory / f"{name}.c", directory / f"lib{name}.so"
        source.write_text(text)
        output_of("cc", "-shared", "-fPIC", f"-Wl,-soname,{library.name}", "-o", library,
                  f"-I{TREE}/vorlane", source)
        libraries.append(str(library))
    return ";".join(libraries)
