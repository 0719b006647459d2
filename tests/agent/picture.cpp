// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// Draws what a program shows on a terminal, as an SVG.
//
//   terminal_picture FILE COLUMNS ROWS UNTIL COMMAND [ARG...]
//
// The picture is taken when the text UNTIL is on the screen; the program is then
// ended.
#include "terminal_session.h"

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

namespace
{

constexpr int kCharacterWidth = 9;
constexpr int kLineHeight = 19;
constexpr int kMargin = 14;
constexpr double kPatience = 120;

const char *colour_name(int colour)
{
    static constexpr const char *names[] = {"#21262d", "#ff7b72", "#7ee787", "#e3b341",
                                            "#79c0ff", "#d2a8ff", "#56d4dd", "#e6edf3"};
    return colour >= 0 && colour < 8 ? names[colour] : "#e6edf3";
}

std::string escaped(const std::string &text)
{
    std::string result;
    for (const char c : text) {
        switch (c) {
        case '&':
            result += "&amp;";
            break;
        case '<':
            result += "&lt;";
            break;
        default:
            result += c;
        }
    }
    return result;
}

// A row's text in pieces of one colour each.
std::string drawn_row(const TerminalSession &session, int row)
{
    std::string drawn;
    int column = 0;
    while (column < session.columns()) {
        const TerminalSession::Cell first = session.cell(row, column);
        if (first.text.empty() || first.text == " ") {
            ++column;
            continue;
        }
        const int colour = first.colour;
        const int begin = column;
        std::string text;
        while (column < session.columns() && session.cell(row, column).colour == colour) {
            const std::string cell = session.cell(row, column++).text;
            text += cell.empty() ? " " : cell;
        }
        text.erase(text.find_last_not_of(' ') + 1);
        std::ostringstream piece;
        piece << "<text x=\"" << kMargin + begin * kCharacterWidth << "\" y=\""
              << kMargin + row * kLineHeight + 14 << "\" fill=\"" << colour_name(colour)
              << "\" textLength=\"" << text.size() * kCharacterWidth << "\">" << escaped(text)
              << "</text>\n";
        drawn += piece.str();
    }
    return drawn;
}

std::string drawn(const TerminalSession &session)
{
    const int rows = static_cast<int>(session.all_lines().size());
    const int width = 2 * kMargin + session.columns() * kCharacterWidth;
    const int height = 2 * kMargin + rows * kLineHeight;
    std::ostringstream svg;
    svg << "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"" << width << "\" height=\"" << height
        << "\" viewBox=\"0 0 " << width << " " << height << "\">\n"
        << "<rect width=\"100%\" height=\"100%\" rx=\"8\" fill=\"#0d1117\"/>\n"
        << "<g font-family=\"DejaVu Sans Mono, Menlo, Consolas, monospace\" font-size=\"15\" "
           "xml:space=\"preserve\">\n";
    for (int row = 0; row < rows; ++row) {
        svg << drawn_row(session, row);
    }
    svg << "</g>\n</svg>\n";
    return svg.str();
}

} // namespace

int main(int argc, char **argv)
{
    if (argc < 6) {
        std::fputs("usage: terminal_picture FILE COLUMNS ROWS UNTIL COMMAND [ARG...]\n", stderr);
        return EXIT_FAILURE;
    }
    const std::string until = argv[4];
    TerminalSession session({argv + 5, argv + argc}, std::atoi(argv[2]), std::atoi(argv[3]));
    if (!session.wait_for_text(until, kPatience)) {
        std::fprintf(stderr, "terminal_picture: '%s' has not come; there was\n%s", until.c_str(),
                     session.text().c_str());
        return EXIT_FAILURE;
    }
    std::ofstream file(argv[1]);
    file << drawn(session);
    file.close();
    if (!file) {
        std::fprintf(stderr, "terminal_picture: %s cannot be written\n", argv[1]);
        return EXIT_FAILURE;
    }
    return EXIT_SUCCESS;
}
