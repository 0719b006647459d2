# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What the product is from outside: its symbols, what it needs, how it compiles."""
import ctypes
import platform
import re
import sys
import sysconfig

import pytest
from libraries import INTERFACE, entries_of, exports_of
from support.outside import BUILD, CACHE, TREE, output_of, run

LIBRARY = BUILD / "libquillmark.so"
VORLANE = BUILD / "libvorlane.so"
SMALL = BUILD / "small" / sysconfig.get_config_var("MULTIARCH") / "libquillmark.so"
SOURCE = TREE / "src/quillmark.cpp"
HEADER = TREE / "src/quillmark.h"
WARNINGS = "-Wall -Wextra -Wpedantic -Werror".split()


# ---- the libraries -------------------------------------------------------------------

@pytest.mark.parametrize("library, name, needed, exports", [
    (LIBRARY, "libquillmark.so.1", "libc.so.6 libmxml.so.1 libvorlane.so", INTERFACE),
    (SMALL, "libquillmark.so.1", "libc.so.6 libmxml.so.1 libvorlane.so", INTERFACE),
    (VORLANE, "libvorlane.so", "libc.so.6 libmxml.so.1",
     ["Accept", "Bind", "Setsockopt", "get_node_value", "mxmlSetLoneWhitespaceOff",
      "vr_log_printf"])], ids=["shipped", "small", "platform"])
def test_a_library_has_its_name_needs_few_and_exports_its_interface_alone(
        library, name, needed, exports):
    assert entries_of(library, "SONAME") == [name]
    assert entries_of(library, "NEEDED") == needed.split()
    assert exports_of(library) == exports


def test_the_small_library_that_is_measured_answers_a_ping():
    ctypes.CDLL(VORLANE)  # the small one asks for it by its name only
    reply = ctypes.create_string_buffer(64)
    assert ctypes.CDLL(SMALL).FPTEST_RunTestCmd(b"pingtest", reply, len(reply)) == 0
    assert reply.value == b"Ping Success!"


# ---- what is taken for granted of a C library: what Android's, musl and glibc share ----

@pytest.mark.parametrize("compiler", [
    "g++", "clang++", f"clang++ --target={platform.machine()}-linux-android28"])
def test_a_bare_libc_is_all_that_it_is_compiled_and_linked_with(compiler, tmp_path):
    musl = platform.machine() + "-linux-musl"
    output_of(TREE / "tests/library/bare-libc", tmp_path, f"/usr/include/{musl}",
              f"/usr/lib/{musl}/libc.so", CACHE["MINIXML_INCLUDE_DIR"] + "/mxml.h", "ld",
              *compiler.split())


def test_as_it_is_shipped_it_asks_nothing_else_of_its_c_library():
    """No name that ends in _chk, too."""
    listing = output_of("nm", "--dynamic", "--undefined-only", LIBRARY)
    asked = re.findall(r" U (\w+)@GLIBC", listing)
    assert len(asked) > 30
    shared = re.sub("#.*", "", (TREE / "tests/library/libc_names.txt").read_text()).split()
    assert set(asked) <= set(shared)


# ---- the source ----------------------------------------------------------------------

@pytest.mark.parametrize("compiler", ["g++", "clang++"])
@pytest.mark.parametrize("options", ["-O0", "-Os -DNDEBUG", "-O2", "-O3 -DNDEBUG"])
def test_the_source_compiles_without_a_warning(compiler, options):
    output_of(compiler, "-std=c++20", *options.split(), *WARNINGS, "-Wconversion",
              "-Wshadow", "-fPIC", "-fno-exceptions", "-fno-rtti", f"-I{TREE}/vorlane",
              "-c", "-o", "/dev/null", SOURCE)


REPORT = """import ctypes, sys
ctypes.CDLL(sys.argv[1])
ctypes.CDLL(sys.argv[2]).FPTEST_SetTransation(b"none", b"none", 1, 0, b"")"""


@pytest.mark.parametrize("compiler", ["g++", "clang++"])
def test_a_line_is_logged_with_the_number_where_its_call_begins(compiler, tmp_path):
    library = tmp_path / "libquillmark.so"
    output_of(compiler, "-std=c++20", "-fPIC", "-shared", "-o", library, SOURCE,
              f"-I{TREE}/vorlane", VORLANE, CACHE["MINIXML_LIBRARY"])
    outcome = run(sys.executable, "-c", REPORT, VORLANE, library, env={"VR_LOG_FILE": None})
    assert outcome.status == 0, outcome.err
    call = SOURCE.read_text().partition('LOG("index=')[0].count("\n") + 1
    assert f":{call:04}:" in re.search("^.*=> index=.*$", outcome.err, re.M)[0]


def test_the_source_includes_headers_of_the_c_library_alone():
    included = re.findall(r"^[ \t]*#[ \t]*include\b[ \t]*(\S*)",
                          SOURCE.read_text() + HEADER.read_text(), re.M)
    assert len(included) > 10
    assert set(included) <= set("""
        <assert.h> <errno.h> <fcntl.h> <mxml.h> <netinet/in.h> <signal.h> <stdarg.h>
        <stdint.h> <stdio.h> <stdlib.h> <string.h> <sys/socket.h> <sys/types.h>
        <sys/wait.h> <unistd.h>
        "quillmark.h" "mxml_whitespace.h" "sockwrap.h" "sysparm.h" "vr_log.h"
        """.split())


@pytest.mark.parametrize("compiler, language", [
    ("gcc -std=c11", "c"), ("clang -std=c11", "c"),
    ("g++ -std=c++11", "cpp"), ("clang++ -std=c++20", "cpp")])
def test_the_header_is_usable_by_itself(compiler, language, tmp_path):
    use = tmp_path / f"use.{language}"
    use.write_text("""#include "quillmark.h"
int use(void);
int use(void)
{
    char reply[64];
    fpTest_TestMsg_t message;
    mxml_node_t *tree = g_TestCmdTree;
    FPTEST_ExtractResultMsg(reply, (int)sizeof reply);
    message.testMsgHead[0] = reply[0];
    return FPTEST_RunTestCmd("pingtest", reply, 64)
        + FPTEST_SetTransation("g", "i", 1, 0, 0)
        + FPTEST_SuspendItemExecute() + message.testMsgHead[0] + (tree != 0);
}
""")
    output_of(*compiler.split(), *WARNINGS, f"-I{TREE}/src", "-c", "-o", "/dev/null", use)
