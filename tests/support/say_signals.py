# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""Says "ready" and what signals it gets, and ends with 7 a quarter of a second after the last."""
import signal
import sys

SIGNALS = {signal.SIGHUP, signal.SIGINT, signal.SIGQUIT, signal.SIGTERM}

signal.pthread_sigmask(signal.SIG_BLOCK, SIGNALS)
print("ready", flush=True)
patience = 30
while got := signal.sigtimedwait(SIGNALS, patience):
    print(signal.Signals(got.si_signo).name.removeprefix("SIG"), flush=True)
    patience = 0.25
sys.exit(7)
