# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What a device that has a serial number is called in its results."""
import json

import pytest

from support.outside import make_program, output_of, DEVICE_RUN

pytestmark = pytest.mark.usefixtures("namespaces")


@pytest.mark.parametrize("options, name", [((), "R58M42"), (("--label", "device=A7"), "A7")])
def test_a_device_is_called_by_its_serial_number(tmp_path, options, name):
    make_program(tmp_path / "getprop", '#!/system/bin/sh\n[ "$1" = ro.serialno ] && echo R58M42\n')
    lines = output_of(DEVICE_RUN, "--bin", tmp_path, "--", "fptest", "run", *options, "--json", "-",
                      "--plan", "plans/demo.xml", "demo/Bringup/SpiCheck").splitlines()

    assert json.loads(lines[0])["labels"] == {"device": name}
