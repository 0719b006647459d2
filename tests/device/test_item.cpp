// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// A test item that notes how it was started, so that a test can see what ran.
//   --sleep SECONDS   stays that long before it ends
//   --vendor TEXT     writes the vendor selector
//   --report GROUP ITEM PROGRESS RESULT DESCRIPTION
//                     reports through the library
// Every other argument is only noted.
#include "quillmark.h"

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <string>
#include <thread>

int main(int argc, char **argv)
{
    std::string note = argv[0];
    double seconds = 0;
    for (int at = 1; at < argc; ++at) {
        const std::string argument = argv[at];
        note += "|" + argument;
        if (argument == "--sleep" && at + 1 < argc) {
            seconds = std::atof(argv[at + 1]);
        }
        if (argument == "--report" && at + 5 < argc) {
            FPTEST_SetTransation(argv[at + 1], argv[at + 2], std::atoi(argv[at + 3]),
                                 std::atoi(argv[at + 4]), argv[at + 5]);
        }
        if (argument == "--vendor" && at + 1 < argc) {
            std::ofstream("/etc/vorlane/sysparms/vr_common_cfg.xml")
                << "<device><SysParam><Quillmark><vendor>" << argv[at + 1]
                << "</vendor></Quillmark></SysParam></device>";
        }
    }
    std::ofstream("/data/vorlane/ran.txt", std::ios::app) << note + "\n" << std::flush;
    std::this_thread::sleep_for(std::chrono::duration<double>(seconds));
}
