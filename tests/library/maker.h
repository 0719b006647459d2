// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Libraries of another maker, which do nothing.
#pragma once

#include "outside.h"

#include <gtest/gtest.h>

#include <string>

inline constexpr char kMaker[] =
    "#include \"mxml_whitespace.h\"\n"
    "#include \"sockwrap.h\"\n"
    "#include \"sysparm.h\"\n"
    "#include \"vr_log.h\"\n"
    "void mxmlSetLoneWhitespaceOff(int off) { (void)off; }\n"
    "void Setsockopt(int d, const int *v) { (void)d; (void)v; }\n"
    "void Bind(int d, const struct sockaddr *a, socklen_t l)\n"
    "{ (void)d; (void)a; (void)l; }\n"
    "int Accept(int d, struct sockaddr *a, socklen_t *l)\n"
    "{ (void)d; (void)a; (void)l; return -1; }\n"
    "int get_node_value(const char *f, const char *p, char *b, size_t l)\n"
    "{ (void)f; (void)p; (void)b; (void)l; return -1; }\n";
inline constexpr char kLog[] = "#include \"vr_log.h\"\n"
                               "int vr_log_printf(int p, const char *t, const char *f, ...)\n"
                               "{ (void)p; (void)t; (void)f; return 0; }\n";

inline void make_library(const TemporaryDirectory &directory, const std::string &name,
                         const std::string &text)
{
    const std::string source = directory.write(name + ".c", text);
    const std::string file = "lib" + name + ".so";
    const Ended made =
        run_shell("cc -shared -fPIC -I" + quoted(kSource + "/vorlane") + " -Wl,-soname," + file +
                  " -o " + quoted(directory.path("") + file) + " " + quoted(source));
    ASSERT_EQ(made.status, 0) << made.out;
}

// libmaker.so and libmakerlog.so in the directory, as a list of CMake's.
inline std::string make_makers_libraries(const TemporaryDirectory &directory)
{
    make_library(directory, "maker", kMaker);
    make_library(directory, "makerlog", kLog);
    return directory.path("libmaker.so;") + directory.path("libmakerlog.so");
}
