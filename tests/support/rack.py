# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Runs on virtual devices, to make pages of."""
from support.outside import make_program, on_device

PASS = 'fptest report "$1" "${0##*/}" --progress 100 --result'
ITEMS = {
    "SpiCheck": f'{PASS} 0 --description "chip 0x1a2b answers at 8 MHz"',
    "Supply": f"""
        fptest measure vcore 1.$((200 + QM * 41 % 59)) V 1.15 1.25
        fptest measure ripple $((4 + QM * 5 % 9)) mV - 12
        {PASS} 0""",
    "DeadPixel": f"""
        echo "a frame of 160 x 160"
        fptest measure dead_pixels $((QM * 7 % 4)) - - 2
        {PASS} $((QM * 7 % 4 > 2)) --description "$((QM * 7 % 4)) dead pixels, limit 2" """,
    # flaky on some devices: it passes when it is tried again
    "Noise": f"""
        fptest measure noise $((20 + QM * 11 % 17)).5 dB 18 40
        [[ -e /tmp/tried || $((QM % 5)) -ne 3 ]]; bad=$?
        touch /tmp/tried
        {PASS} $bad --description 'noise over 64 frames'""",
    "Finger": f"[[ $QM -ne 6 ]] || sleep 9; {PASS} 0",
}
PLAN = ('<?xml version="1.0"?><plan><CmdGroup name="Bringup"><Cmd name="SpiCheck" args="Bringup"/>'
        '<Cmd name="Supply" args="Bringup"/><Cmd name="DeadPixel" args="Bringup"/></CmdGroup>'
        '<CmdGroup name="Sensor"><Cmd name="Noise" args="Sensor"/>'
        '<Cmd name="Finger" args="Sensor"/></CmdGroup></plan>')


def runs_of(directory, devices, *options):
    """The JSON lines of that many devices."""
    programs, out = directory / "bin", directory / "out"
    programs.mkdir(parents=True)
    out.mkdir()
    for name, script in ITEMS.items():
        make_program(programs / name, f"#!/system/bin/sh\n{script}\n")
    (out / "line-3.xml").write_text(PLAN)
    for device in range(1, devices + 1):
        ended = on_device(
            "fptest", "run", "--plan", "line-3.xml", "--timeout", "1", "--retry", "1",
            "--judge-limits", "--label", f"device=qm-{device:02}", "--json", f"{device:02}.jsonl",
            *options, options=("--bin", programs, "--out", out), cwd=out, env={"QM": str(device)})
        assert ended.status in (0, 1), ended
    return sorted(out.glob("*.jsonl"))
