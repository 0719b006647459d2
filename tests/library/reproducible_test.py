# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Whoever builds the libraries from the same sources gets the same bytes."""
import shutil
import time

import pytest
from support.outside import TREE, output_of


def build(place, build_type, umask, **env):
    """Builds copies of all that may be of use for that."""
    shutil.copytree(TREE, place, symlinks=True, ignore=lambda directory, names:
                    {".git", "build", "fuzz", "tests"} if directory == str(TREE) else ())
    for words in (("-S", place, "-B", place / "build", "-DQUILLMARK_BUILD_TOOLS=OFF",
                   f"-DCMAKE_BUILD_TYPE={build_type}"),
                  ("--build", place / "build", "--target", "quillmark", "vorlane")):
        output_of("cmake", *words, umask=umask, env=env)


@pytest.mark.parametrize("build_type", ["Release", "MinSizeRel"])
def test_libraries_of_two_folders_have_the_same_bytes(build_type, tmp_path):
    one, other = tmp_path / "a", tmp_path / "another place/some levels/deeper"
    build(one, build_type, 0o022, TZ="UTC", LC_ALL="C")
    time.sleep(1)  # file times are of another second
    build(other, build_type, 0o077, TZ="Asia/Tokyo", LC_ALL="C.UTF-8")

    for library in ("build/libquillmark.so", "build/libvorlane.so"):
        content = (one / library).read_bytes()
        assert len(content) > 10_000
        assert content == (other / library).read_bytes()
        assert str(tmp_path).encode() not in content
