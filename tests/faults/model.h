// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

// What the module must show for a command, with or without a fault in it: an
// independent account of its calls, log lines, replies and files, step by step.
#pragma once

#include <cstddef>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace faults
{

// One call to fail: the function, and which of its calls, counted from 1.
struct Fault {
    std::string function;
    long number = 0;
    bool cut = false; // a write that stores kCut bytes rather than none
};
constexpr std::size_t kCut = 5;

// An element, or a text where there is no name for it and a text.
struct Node {
    std::string name; // empty: the memory for it was missing
    std::vector<std::pair<std::string, std::string>> attributes;
    std::vector<Node> children;
    std::string text;

    [[nodiscard]] const std::string *attribute(const std::string &wanted) const;
};

// A document as it is sent.
std::string source(const Node &top);

// Mini-XML ends the process, in the function named.
struct Death {
    std::string place;
};

class Model
{
  public:
    explicit Model(Fault fault);

    struct Result {
        int value = 0;
        std::optional<std::string> reply; // none: the buffer stays as it was
    };

    Result ping();
    Result nothing(); // a null command
    Result store(const Node &document);
    Result run_group(const std::string &group);
    Result run_item(const std::string &group, const std::string &item, const std::string &output);
    Result report(const std::string &group, const std::string &item, int progress,
                  const std::string &description);
    Result read_back();
    Result suspend(const std::string &header, const std::string &line);

    // The events since the last call of this function.
    std::vector<std::string> events();
    [[nodiscard]] std::vector<std::string> left_open() const;
    // The plan file's text; none where there is no file.
    [[nodiscard]] std::optional<std::string> file() const;
    [[nodiscard]] bool loaded() const;

    // Whether the fault has been met, and in what: an allocation is named by
    // what was to be stored in it.
    [[nodiscard]] bool met() const;
    [[nodiscard]] const std::string &met_in() const;
    // What Mini-XML has made of it without telling, if anything.
    [[nodiscard]] const std::string &damage() const;

  private:
    struct File {
        std::string text;
        std::optional<Node> tree; // none: Mini-XML refuses the text
    };
    struct Reading; // of a document by Mini-XML

    bool fails(const std::string &function);
    bool memory_fails(const std::string &what);
    void record(const std::string &event);
    void log(const std::string &function, const std::string &text);
    void log_place(const std::string &function, const std::string &text);
    std::string new_name(const std::string &kind);
    std::string opened(const std::string &flags, bool there, int &error);
    void close(const std::string &name);

    bool parse(const std::string &head, const std::string &name);
    void load();
    std::optional<Node> parsed();
    Node element(const Node &from, Reading &reading);
    void read_text(const Node &from, Node &parent);
    void read_attributes(const Node &from, Node &node);
    void grow(std::size_t length, std::size_t &room);
    void set_attribute(Node &node, const std::string &name, const std::string &value);
    void save();

    int index_of(const std::string &group, const std::string &item);
    Node *item_of(const std::string &function, const std::string &group, const std::string &item);
    int length_of(const std::string &group);
    const Node *at_index(const std::string &group, int index);
    int path_level(const std::string &path, int level, const std::string &last);
    void path_names(const std::vector<std::string> &components);
    void run(const std::string &group, int index, const std::string &output);
    int presence(const std::string &output);
    void launch();
    void trigger();

    Fault fault_;
    std::map<std::string, long> made_;
    std::map<std::string, long> calls_;
    std::vector<std::string> events_;
    std::vector<std::string> open_;
    std::optional<File> file_;
    std::optional<Node> cache_;
    std::string command_name_;
    bool pinged_ = false;
    bool library_in_use_ = false;
    bool met_ = false;
    std::string met_in_;
    std::string damage_;
};

} // namespace faults
