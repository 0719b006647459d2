// SPDX-FileCopyrightText: 2026 The Quillmark authors
// SPDX-License-Identifier: Apache-2.0

#include "model.h"

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "../unit/sequences.h"

namespace faults
{
namespace
{

constexpr char kPath[] = "/data/vorlane/src1.xml";
constexpr std::size_t kRoom = 64; // Mini-XML's buffers, at first

bool is_text(const Node &node)
{
    return !node.text.empty();
}
bool is_markup(const Node &node)
{
    return node.name[0] == '?' || node.name[0] == '!';
}

std::string attribute_text(const std::pair<std::string, std::string> &attribute)
{
    return attribute.first + "=\"" + attribute.second + "\"";
}

// In document order, without the top itself.
void list_below(Node &top, std::vector<Node *> &nodes)
{
    for (Node &child : top.children) {
        nodes.push_back(&child);
        list_below(child, nodes);
    }
}

// The first element behind the given one with that name, and that attribute
// "name" where one is given.
Node *find_behind(Node &top, const Node *behind, const std::string &element,
                  const std::string *name)
{
    std::vector<Node *> nodes;
    list_below(top, nodes);
    auto at = std::find(nodes.begin(), nodes.end(), behind);
    at = at == nodes.end() ? nodes.begin() : at + 1;
    const auto found = std::find_if(at, nodes.end(), [&](const Node *node) {
        const std::string *own = node->attribute("name");
        return node->name == element && (name == nullptr || (own != nullptr && *own == *name));
    });
    return found != nodes.end() ? *found : nullptr;
}

// The children among which a node stands, and where.
std::pair<const std::vector<Node> *, std::size_t> place_of(const Node &top, const Node *node)
{
    for (std::size_t at = 0; at < top.children.size(); ++at) {
        if (&top.children[at] == node) {
            return {&top.children, at};
        }
        const auto found = place_of(top.children[at], node);
        if (found.first != nullptr) {
            return found;
        }
    }
    return {nullptr, 0};
}

bool has_nameless(const Node &node)
{
    return (node.name.empty() && !is_text(node)) ||
           std::any_of(node.children.begin(), node.children.end(), has_nameless);
}

// As Mini-XML writes a tree with the module's indentation.
std::string saved(const Node &node, int ancestors)
{
    if (is_text(node)) {
        return node.text;
    }
    const auto tabs = static_cast<std::size_t>(std::clamp(ancestors - 1, 0, 8));
    std::string text = std::string(tabs, '\t') + "<" + node.name;
    std::size_t column = 8 * tabs + node.name.size() + 1;
    for (const auto &attribute : node.attributes) {
        const std::string added = attribute_text(attribute);
        const bool wraps = column + added.size() > 72;
        text += (wraps ? "\n" : " ") + added;
        column = (wraps ? 0 : column + 1) + added.size();
    }
    if (node.children.empty()) {
        return text + (is_markup(node) ? ">\n" : " />\n");
    }
    text += ">\n";
    for (const Node &child : node.children) {
        text += saved(child, ancestors + 1);
    }
    return is_markup(node) ? text : text + "</" + node.name + ">\n";
}

std::string quoted(const std::string &text)
{
    return "\"" + text + "\"";
}

std::string shown(const std::string *text)
{
    return text != nullptr ? *text : "(null)";
}

} // namespace

const std::string *Node::attribute(const std::string &wanted) const
{
    const auto found = std::find_if(attributes.begin(), attributes.end(),
                                    [&](const auto &pair) { return pair.first == wanted; });
    return found != attributes.end() ? &found->second : nullptr;
}

std::string source(const Node &top)
{
    if (is_text(top)) {
        return top.text;
    }
    std::string text = (top.name[0] == '?' ? "<" : "\n<") + top.name;
    for (const auto &attribute : top.attributes) {
        text += " " + attribute_text(attribute);
    }
    text += !is_markup(top) && top.children.empty() ? "/>" : ">";
    for (const Node &child : top.children) {
        text += source(child);
    }
    if (is_markup(top) || top.children.empty()) {
        return text;
    }
    return text + (is_text(top.children.back()) ? "" : "\n") + "</" + top.name + ">";
}

// --- what all steps share --------------------------------------------------

Model::Model(Fault fault) : fault_(std::move(fault))
{
}

bool Model::fails(const std::string &function)
{
    const bool now = ++calls_[function] == fault_.number && function == fault_.function;
    met_ = met_ || now;
    return now;
}

bool Model::memory_fails(const std::string &what)
{
    const bool now = fails("Mini-XML's memory");
    if (now) {
        met_in_ = what;
    }
    return now;
}

void Model::record(const std::string &event)
{
    events_.push_back(event);
}
void Model::log(const std::string &function, const std::string &text)
{
    record(function + "| " + text);
}
void Model::log_place(const std::string &function, const std::string &text)
{
    log(function, function + "[]" + text);
}

std::string Model::new_name(const std::string &kind)
{
    return kind + "#" + std::to_string(++made_[kind]);
}

// The descriptor's name, or "-1".
std::string Model::opened(const std::string &flags, bool there, int &error)
{
    error = fails("open") ? EMFILE : there ? 0 : ENOENT;
    std::string name = error != 0 ? "-1" : new_name("plan");
    record(std::string("open(") + kPath + ", " + flags + ") = " + name);
    return name;
}

void Model::close(const std::string &name)
{
    fails("close"); // and nobody asks
    record("close(" + name + ")");
}

std::vector<std::string> Model::events()
{
    return std::exchange(events_, {});
}
std::vector<std::string> Model::left_open() const
{
    auto names = open_;
    std::sort(names.begin(), names.end());
    return names;
}
std::optional<std::string> Model::file() const
{
    return file_ ? std::optional(file_->text) : std::nullopt;
}
bool Model::loaded() const
{
    return cache_.has_value();
}
bool Model::met() const
{
    return met_;
}
const std::string &Model::met_in() const
{
    return met_in_;
}
const std::string &Model::damage() const
{
    return damage_;
}

// --- Mini-XML: what it allocates, in its order -----------------------------

struct Model::Reading {
    std::size_t room = kRoom; // of its text buffer
};

namespace
{
struct Refused {
};
struct EndedEarly {
};
} // namespace

void Model::grow(std::size_t length, std::size_t &room)
{
    while (length > room - 4) {
        room *= 2;
        if (memory_fails("realloc(" + std::to_string(room) + ")")) {
            throw Refused{};
        }
    }
}

void Model::set_attribute(Node &node, const std::string &name, const std::string &value)
{
    const std::string damage = "an attribute keeps what it was";
    if (memory_fails("strdup(" + value + ")")) {
        damage_ = damage;
        return;
    }
    for (auto &attribute : node.attributes) {
        if (attribute.first == name) {
            attribute.second = value;
            return;
        }
    }
    const std::string list = node.attributes.empty() ? "malloc" : "realloc";
    const std::string size = std::to_string(2 * sizeof(char *) * (node.attributes.size() + 1));
    if (memory_fails(list + "(" + size + ")") || memory_fails("strdup(" + name + ")")) {
        damage_ = damage;
        return;
    }
    node.attributes.emplace_back(name, value);
}

void Model::read_attributes(const Node &from, Node &node)
{
    if (from.attributes.empty()) {
        return;
    }
    if (memory_fails("malloc(64)") || memory_fails("malloc(64)")) {
        throw Refused{};
    }
    std::size_t name_room = kRoom;
    std::size_t value_room = kRoom;
    for (const auto &[name, value] : from.attributes) {
        grow(name.size(), name_room);
        grow(value.size(), value_room);
        set_attribute(node, name, value);
    }
}

void Model::read_text(const Node &from, Node &parent)
{
    if (memory_fails("calloc")) {
        throw Refused{};
    }
    if (memory_fails("strdup(" + from.text + ")")) {
        parent.children.emplace_back(); // without its text
        return;
    }
    parent.children.push_back(from);
}

Node Model::element(const Node &from, Reading &reading)
{
    grow(from.name.size(), reading.room);
    if (memory_fails("calloc")) {
        if (from.name[0] == '!') {
            damage_ = "the tree ends before a comment";
            throw EndedEarly{};
        }
        throw Refused{};
    }
    Node node;
    const auto skip_white_space = [&] {
        if (!memory_fails("calloc")) {
            if (memory_fails("strdup()")) {
                node.children.emplace_back();
            }
        }
    };
    if (!memory_fails("strdup(" + from.name + ")")) {
        node.name = from.name;
    }
    read_attributes(from, node);
    try {
        for (const Node &child : from.children) {
            if (is_text(child)) {
                grow(child.text.size(), reading.room);
                read_text(child, node);
            } else {
                skip_white_space();
                node.children.push_back(element(child, reading));
            }
        }
    } catch (const EndedEarly &) {
        return node;
    }
    if (is_markup(from) || from.children.empty()) {
        return node;
    }
    if (!is_text(from.children.back())) {
        skip_white_space();
    }
    grow(from.name.size() + 1, reading.room);
    if (node.name.empty()) {
        throw Death{"mxml_load_data"};
    }
    return node;
}

std::optional<Node> Model::parsed()
{
    if (!std::exchange(library_in_use_, true) && memory_fails("calloc")) {
        throw Death{"_mxml_global"};
    }
    if (memory_fails("malloc(64)") || fails("Mini-XML's read") || !file_->tree) {
        return std::nullopt;
    }
    try {
        Reading reading;
        Node top = element(*file_->tree, reading);
        fails("Mini-XML's read"); // taken for the end, which it is
        return has_nameless(top) ? std::nullopt : std::optional(top);
    } catch (const Refused &) {
        return std::nullopt;
    }
}

// --- the plan ----------------------------------------------------------------

void Model::load()
{
    if (cache_) {
        return;
    }
    record("mxmlSetLoneWhitespaceOff(1)");
    int error = 0;
    const std::string name = opened("O_RDONLY", file_.has_value(), error);
    if (error != 0) {
        log("load_configs_file", std::string("Open ") + kPath + " file failed(" +
                                     std::to_string(error) + ")," + strerror(error) + "\n");
        return;
    }
    cache_ = parsed();
    close(name);
}

void Model::save()
{
    log("save_XmlFile", "enter...\n");
    int error = 0;
    const std::string name = opened("O_RDWR|O_CREAT|O_TRUNC|O_SYNC, 0666", true, error);
    if (error != 0) {
        log("save_XmlFile", std::string("Open ") + kPath + " file failed(" + std::to_string(error) +
                                ")," + strerror(error) + "\n");
        return;
    }
    file_ = File{saved(*cache_, 0), cache_};
    if (fails("Mini-XML's write")) {
        file_ = File{};
    }
    close(name);
    log("save_XmlFile", "leave...\n");
}

Node *Model::item_of(const std::string &function, const std::string &group, const std::string &item)
{
    load();
    if (!cache_) {
        log_place(function, ":load config file failed\n");
        return nullptr;
    }
    const Node *found = find_behind(*cache_, nullptr, "CmdGroup", &group);
    Node *node = found != nullptr ? find_behind(*cache_, found, "Cmd", &item) : nullptr;
    if (node == nullptr) {
        log_place(function, ":mxml Find Path failed\n");
    }
    return node;
}

int Model::index_of(const std::string &group, const std::string &item)
{
    log("get_node_index", "enter...\n");
    const Node *node = item_of("get_node_index", group, item);
    return node != nullptr ? static_cast<int>(place_of(*cache_, node).second) : -1;
}

int Model::length_of(const std::string &group)
{
    log("get_node_length", "Enter node length calculate!\n");
    log("get_node_length", "input level = 2\n");
    load();
    if (!cache_) {
        log_place("get_node_length", ":load config file failed\n");
        return -1;
    }
    const Node *node = find_behind(*cache_, nullptr, "CmdGroup", &group);
    if (node == nullptr) {
        log_place("get_node_length", ":mxml Find Path failed\n");
        return -1;
    }
    const auto length = node->children.size();
    log("get_node_length", "node length = " + std::to_string(length) + "!\n");
    return static_cast<int>(length);
}

const Node *Model::at_index(const std::string &group, int index)
{
    log("get_node_byIndex", "enter...\n");
    if (!cache_) {
        log_place("get_node_byIndex", ":load config file failed\n");
        return nullptr;
    }
    const Node *found = find_behind(*cache_, nullptr, "CmdGroup", &group);
    if (found == nullptr) {
        log_place("get_node_byIndex", ": Find Element \"registers\" failed\n");
        return nullptr;
    }
    const Node *node = find_behind(*cache_, found, "Cmd", nullptr);
    if (node != nullptr) {
        const auto [siblings, first] = place_of(*cache_, node);
        const auto at = first + static_cast<std::size_t>(index);
        node = index >= 0 && at < siblings->size() ? &(*siblings)[at] : nullptr;
    }
    log("get_node_byIndex", "curernt leaf node name = " +
                                shown(node != nullptr ? node->attribute("name") : nullptr) + "\n");
    log("get_node_byIndex", "leave...\n");
    return node;
}

// --- items -------------------------------------------------------------------

int Model::presence(const std::string &output)
{
    static const std::string query = "ps | grep /system/bin/SensorProbe";
    log("ResourceReduce", "\ncbuf=" + query + "\n");
    if (fails("popen")) {
        record("popen(" + query + ", r) = null");
        log("ResourceReduce", "popen error!\n");
        return -1;
    }
    const std::string stream = new_name("stream");
    record("popen(" + query + ", r) = " + stream);
    const bool listed = !fails("fgets") && !output.empty();
    record("fgets(" + stream + ", 129) = " + (listed ? quoted(output) : "null"));
    log("ResourceReduce",
        listed ? "\ntbuf=" + output + "\n" : std::string("target process not exist!\n"));
    fails("pclose");
    record("pclose(" + stream + ")");
    return listed ? 1 : 0;
}

void Model::launch()
{
    if (fails("sigprocmask")) { // the mask is not known, so nothing is to be put back
        for (const auto &event : sequences::blocked_signals()) {
            record(event);
        }
        return;
    }
    const bool started = !fails("vfork");
    const int waited = started && fails("waitpid") ? -1 : 0;
    fails("sigprocmask"); // the way back
    for (const auto &event : started ? sequences::launch(waited) : sequences::failed_launch()) {
        record(event);
    }
}

void Model::trigger()
{
    const auto log_error = [this](int error) {
        log("Sock_Init1", "errno=" + std::to_string(error));
    };
    const bool socket = !fails("socket"); // without one the rest fails as well
    const std::string listener = socket ? new_name("listener") : "-1";
    record("socket(AF_INET, SOCK_STREAM, 0) = " + listener);
    record("Setsockopt(" + listener + ", 1)");
    std::string bind = sequences::listener()[2];
    bind.replace(bind.find("listener#1"), 10, listener);
    record(bind);
    const int listened = !socket ? EBADF : fails("listen") ? EADDRINUSE : 0;
    record("listen(" + listener + ", 5) = " + (listened != 0 ? "-1" : "0"));
    if (listened != 0) {
        log("Sock_Init1", "listen error");
        log_error(listened);
    }
    const int accepted = !socket ? EBADF : fails("Accept") ? ECONNABORTED : 0;
    const std::string connection = accepted != 0 ? "-1" : new_name("connection");
    record("Accept(" + listener + ", 16) = " + connection);
    if (accepted != 0) {
        log("Sock_Init1", "accept error!\n");
        log_error(accepted);
        if (socket) {
            open_.push_back(listener);
        }
        return;
    }
    open_.push_back(connection);
    const bool written = !fails("write") || fault_.cut; // on a socket nothing is cut
    const std::string result = written ? "13" : "-1";
    record("write(" + connection + ", \"gather again!\", 13) = " + result);
    log("Sock_Init1", "retWri=" + result);
    if (!written) {
        log("Sock_Init1", "retWri error");
        log_error(ENOSPC);
    }
    log("Sock_Init1", "retWri success\n");
    close(listener);
}

void Model::run(const std::string &group, int index, const std::string &output)
{
    log("SingleItemExecute", "enter... !\n");
    record("get_node_value(/etc/vorlane/sysparms/vr_common_cfg.xml, "
           "device/SysParam/Quillmark/vendor, 64)");
    record("stdout: vendor = 0\n");
    const Node *node = at_index(group, index);
    if (node == nullptr) {
        log("SingleItemExecute", "get node by Index fail!\n");
        return;
    }
    const std::string *name = node->attribute("name");
    const std::string args = shown(node->attribute("args"));
    log("SingleItemExecute", "mxmlElementGetAttr name=" + shown(name) + "- args=" + args + "\n");
    if (name == nullptr) {
        log("SingleItemExecute", "current node is null !\n");
        return;
    }
    command_name_ = *name;
    const int row = presence(output);
    const std::string command = "/system/bin/" + *name + " " + args;
    log("SingleItemExecute", "tpCmd:" + command + "\n");
    if (*name != "SensorProbe") {
        fails("system");
        record("system(" + command + ")");
        log("SingleItemExecute", "leave... !\n");
        return;
    }
    log("SingleItemExecute", "\nrow=" + std::to_string(row) + "\n");
    if (row == 1) {
        trigger();
        return;
    }
    launch();
    trigger();
    log("SingleItemExecute", "leave... !\n");
}

// --- the steps -----------------------------------------------------------------

// Whether there was memory for the command.
bool Model::parse(const std::string &head, const std::string &name)
{
    if (fails("strdup")) {
        return false;
    }
    log("fptest_ParseCmdLine", "testHead is : " + head + "\n");
    if (!name.empty()) {
        log("fptest_ParseCmdLine", "testName is : " + name + "\n");
    }
    return true;
}

Model::Result Model::ping()
{
    if (!parse("pingtest", "") || std::exchange(pinged_, true)) {
        return {};
    }
    log("FPTEST_RunTestCmd", "Get ping reply success!\n");
    return {0, "Ping Success!"};
}

Model::Result Model::nothing()
{
    return {};
}

Model::Result Model::store(const Node &document)
{
    const std::string text = source(document);
    if (!parse("XMLFile", text)) {
        return {};
    }
    const bool removed = !fails("remove") && file_;
    record(std::string("remove(") + kPath + ") = " + (removed ? "0" : "-1"));
    const std::string old = file_ && !removed ? file_->text : "";
    if (removed) {
        file_.reset();
    }
    int error = 0;
    const std::string name = opened("O_RDWR|O_CREAT, 0666", true, error);
    if (error != 0) {
        log("saveRecvFile", "OPEN FILE FAIL!\n");
    } else {
        open_.push_back(name);
        cache_.reset();
        const bool failed = fails("write");
        const std::size_t written = !failed ? text.size() : fault_.cut ? kCut : 0;
        file_ = File{text.substr(0, written), std::nullopt};
        if (old.size() > written) { // nothing cuts a file that could not be removed
            file_->text += old.substr(written);
        } else if (!failed) {
            file_->tree = document;
        }
        const std::string result = failed && !fault_.cut ? "-1" : std::to_string(written);
        record("write(" + name + ", " + quoted(text) + ", " + std::to_string(text.size()) +
               ") = " + result);
        if (failed) {
            log("saveRecvFile", "WRITE DATA FAIL!\n");
        }
    }
    log("FPTEST_RunTestCmd", "Save source xml file success!\n");
    return {};
}

int Model::path_level(const std::string &path, int level, const std::string &last)
{
    log("fptest_ItemsTest", "Input cmdline : " + path + "\n");
    const bool copied = !fails("strdup");
    log("get_node_level", "level = " + std::to_string(copied ? level : 1) + "\n");
    log("get_node_level", "node name = " + (copied ? last : "") + "\n");
    return copied ? level : 1;
}

void Model::path_names(const std::vector<std::string> &components)
{
    static const char *const kinds[] = {"root", "mid", "leaf"};
    log("get_node_name", "enter...\n");
    for (std::size_t at = 0; at < components.size(); ++at) {
        log("get_node_name", kinds[at] + (" node:" + components[at]) + "\n");
    }
}

Model::Result Model::run_group(const std::string &group)
{
    if (!parse("XMLNodePath", "plan/" + group)) {
        return {};
    }
    if (path_level("plan/" + group, 2, group) == 2) {
        path_names({"plan", group});
        const int count = length_of(group);
        for (int index = 0; index < count; ++index) {
            run(group, index, "");
        }
    }
    return {0, ""};
}

Model::Result Model::run_item(const std::string &group, const std::string &item,
                              const std::string &output)
{
    const std::string path = "plan/" + group + "/" + item;
    if (!parse("XMLNodePath", path)) {
        return {};
    }
    if (path_level(path, 3, item) == 3) {
        path_names({"plan", group, item});
        run(group, index_of(group, item), output);
    }
    return {0, ""};
}

Model::Result Model::report(const std::string &group, const std::string &item, int progress,
                            const std::string &description)
{
    const std::string number = std::to_string(progress);
    log("FPTEST_SetTransation", "enter...\n");
    log("FPTEST_SetTransation", "input node name = " + item + "\n");
    const int index = index_of(group, item);
    log("FPTEST_SetTransation", "iResult = 0\n");
    log("FPTEST_SetTransation", "index=" + std::to_string(index) + " - iResult=0 - iProgress=" +
                                    number + " - iDesc=" + description + "\n");
    log("updateSrcXmlFile", "enter... !\n");
    Node *node = item_of("updateSrcXmlFile", group, item);
    if (node != nullptr) {
        log("updateSrcXmlFile", "curernt node name is: " + item + "\n");
        log("updateSrcXmlFile", "start update progress!\n");
        set_attribute(*node, "progress", number);
        log("updateSrcXmlFile", "start update result!\n");
        set_attribute(*node, "result", "0");
        log("updateSrcXmlFile", "start update description!\n");
        set_attribute(*node, "description", description);
        log("updateSrcXmlFile", "start save xml!\n");
        save();
        log("updateSrcXmlFile", "update Src Xml File success . leave...\n");
    }
    log("FPTEST_SetTransation", "leave...\n");
    return {};
}

Model::Result Model::read_back()
{
    const std::string function = "FPTEST_ExtractResultMsg";
    log(function, "enter... !\n");
    int error = 0;
    const std::string name = opened("O_RDONLY", file_.has_value(), error);
    if (error != 0) {
        log(function, std::string("Open ") + kPath + " file failed!\n");
        return {};
    }
    std::size_t position = 0;
    const auto seek = [&](const std::string &whence, std::size_t to) {
        const bool failed = fails("lseek");
        position = failed ? position : to;
        const std::string result = failed ? "-1" : std::to_string(to);
        record("lseek(" + name + ", 0, " + whence + ") = " + result);
        log(function, "offset = " + result);
    };
    seek("SEEK_CUR", 0);
    seek("SEEK_END", file_->text.size());
    seek("SEEK_SET", 0);

    const std::string text = file_->text.substr(position);
    std::string left = text;
    std::size_t room = 4096;
    for (;;) {
        const std::string call = "read(" + name + ", " + std::to_string(room) + ") = ";
        if (fails("read")) { // and is tried again
            record(call + "-1");
            log_place(function, ":read file failed\n");
            continue;
        }
        const std::string count = std::to_string(left.size());
        record(call + count);
        if (left.empty()) {
            break;
        }
        log(function, "read file unfinish, continue... n = " + count + " \n");
        room -= left.size();
        left.clear();
    }
    log(function, "reach the end of file\n");
    log(function, "read byte count = " + std::to_string(text.size()) + "\n");
    close(name);
    log(function, "leave...\n");
    return {0, text};
}

Model::Result Model::suspend(const std::string &header, const std::string &line)
{
    const std::string function = "FPTEST_SuspendItemExecute";
    const std::string command = ("ps " + command_name_).substr(0, 31);
    log(function, "enter... !\n");
    if (fails("popen")) {
        record("popen(" + command + ", r) = null");
        log(function, "popen error!\n");
        return {-1, {}};
    }
    const std::string stream = new_name("stream");
    open_.push_back(stream);
    record("popen(" + command + ", r) = " + stream);
    for (const auto &text : {header, line}) {
        const bool failed = fails("fgets");
        record("fgets(" + stream + ", 513) = " + (failed ? "null" : quoted(text)));
        if (failed) {
            log(function, "target process not exist!\n");
            return {-1, {}};
        }
    }
    const auto user = line.find(' ');
    log(function, "pid = " + line.substr(user + 1, line.find(' ', user + 1) - user - 1) + "\n");
    launch();
    return {};
}

} // namespace faults
