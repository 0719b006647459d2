# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# The growth's chart, on standard output. Its argument: a file of the six curves, each a
# line with its name in quotes and a line "items seconds" for each point, two empty
# lines between them.
set terminal svg size 720,450 font "sans-serif,13" background "white"
set title "Cost against the number of items (fitted exponent)"
set xlabel "items in the plan"
set ylabel "time for one"
set logscale xy
set xrange [9:11000]
set format y "%.0s %cs"
set xtics ("10" 10, "100" 100, "1,000" 1000, "10,000" 10000)
set grid
set key below
plot for [curve=0:5] ARG1 index curve using 1:2 with linespoints linewidth 2 title columnheader(1)
