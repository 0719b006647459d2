/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/*
 * The whole library, in the order in which it builds on itself: each function
 * stands above its callers. To follow a command, start at the last section and
 * read upward.
 */
#undef NDEBUG /* the read-back's assertion guards the host in release builds too */

#include "quillmark.h"

#include "mxml_whitespace.h"
#include "sockwrap.h"
#include "sysparm.h"
#include "vr_log.h"

#include <assert.h>
#include <errno.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <signal.h>
#include <stdarg.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/types.h>
#include <sys/wait.h>
#include <unistd.h>

/* --- constants and state ------------------------------------------------- */

static const char kPlanPath[] = "/data/vorlane/src1.xml";
static const char kParameterFile[] = "/etc/vorlane/sysparms/vr_common_cfg.xml";
static const char kVendorParameter[] = "device/SysParam/Quillmark/vendor";

/* Written by load_configs_file and saveRecvFile; read wherever the plan is. */
mxml_node_t *g_TestCmdTree;

/* Set by FPTEST_RunTestCmd with the first answered ping, and read there. */
static int g_PingMask;

/* The selector last read: written and read by SingleItemExecute. */
static int32_t vendor;

/* The item last started: written by SingleItemExecute, read by the suspension,
   from whatever thread that is called on. */
static char g_CmdName[65];

/* The trigger channel: written and read by Sock_Init1 alone. */
static int sServer;
static struct sockaddr_in addrServ;
static struct sockaddr_in addrClie;
static char sendBuf[33];

/* --- log and text helpers ------------------------------------------------ */

/* One function for each kind of arguments, never inlined: repeated at every line
   that is logged, the call takes a seventh of the library. */
template <typename... Arguments>
__attribute__((noinline)) static void log_line(const char *format, const char *function, int line,
                                               Arguments... arguments)
{
    vr_log_printf(VR_LOG_DEBUG, "VRCODE", format, function, line, (int)getpid(), (int)gettid(),
                  arguments...);
}

/* sizeof evaluates nothing; it only makes the compiler check the arguments against
   the format. A call stays on one line: of two, compilers differ in which is __LINE__. */
#define LOG(format, ...)                                                                           \
    ((void)sizeof(vr_log_printf(VR_LOG_DEBUG, "", format __VA_OPT__(, ) __VA_ARGS__)),             \
     log_line("%-15s:%04d:pid=%d:ctid=%d => " format, __func__,                                    \
              __LINE__ __VA_OPT__(, ) __VA_ARGS__))

/* A failure that names its place once more. */
#define LOG_PLACE(format) LOG("%s[%d]" format, __func__, __LINE__)

/* printf("%s", NULL) is undefined, and compilers may turn it into puts(NULL),
   which crashes. */
static const char *shown(const char *text)
{
    return text != nullptr ? text : "(null)";
}

/* Fills the array to its capacity: replies are zero after their text. */
static void copy_text(char *array, size_t capacity, const char *text)
{
    const size_t length = strnlen(text, capacity - 1);

    memcpy(array, text, length);
    memset(array + length, 0, capacity - length);
}

/* Formats what fits: commands and attributes are cut without notice. */
__attribute__((format(printf, 3, 4))) static void format_text(char *array, size_t capacity,
                                                              const char *format, ...)
{
    va_list arguments;

    va_start(arguments, format);
    vsnprintf(array, capacity, format, arguments);
    va_end(arguments);
}

/* Appends what fits. */
static void append_text(char *array, size_t capacity, const char *suffix)
{
    strncat(array, suffix, capacity - 1 - strlen(array));
}

/* Cuts a string at its first tab or line feed. */
static void ExtractString(char *iStr, int ilen)
{
    char copy[4097];

    for (char *at = iStr; *at != '\0'; ++at) {
        if (*at == '\t' || *at == '\n') {
            *at = '\0';
        }
    }
    copy_text(copy, sizeof copy, iStr);
    memset(iStr, 0, (size_t)ilen);
    copy_text(iStr, (size_t)ilen, copy);
}

/* --- test plan store ----------------------------------------------------- */

static int is_white(const char *text)
{
    while (*text == ' ' || (*text >= '\t' && *text <= '\r')) {
        ++text;
    }
    return *text == '\0';
}

/* The stock library lacks the switch that load_configs_file sets, and positions
   count every node: what white space it has made nodes of must go. Returns 0,
   with the tree as it was left, when a node of it is not whole: Mini-XML does not
   look whether it could copy a name or a text; where memory was short a node lacks
   it, and the next save ends the process. The root is never text. */
static int remove_lone_whitespace(mxml_node_t *tree)
{
    mxml_node_t *node = tree;

    while (node != nullptr) {
        mxml_node_t *next = mxmlWalkNext(node, tree, MXML_DESCEND);
        const int is_text = mxmlGetType(node) == MXML_TEXT;
        const char *text = is_text ? mxmlGetText(node, nullptr) : mxmlGetElement(node);
        if (text == nullptr) {
            return 0;
        }
        if (is_text && is_white(text)) {
            mxmlDelete(node);
        }
        node = next;
    }
    return 1;
}

static mxml_node_t *load_configs_file(const char *file_path)
{
    if (g_TestCmdTree != nullptr) {
        return g_TestCmdTree;
    }
    mxmlSetLoneWhitespaceOff(1);
    const int fd = open(file_path, O_RDONLY);
    if (fd <= 0) { /* 0 is a failure to every reader of the plan */
        const int error = errno;
        LOG("Open %s file failed(%d),%s\n", file_path, error, strerror(error));
        return nullptr;
    }
    g_TestCmdTree = mxmlLoadFd(nullptr, fd, nullptr);
    close(fd);
    if (g_TestCmdTree != nullptr && !remove_lone_whitespace(g_TestCmdTree)) {
        mxmlDelete(g_TestCmdTree); /* as one that does not parse */
        g_TestCmdTree = nullptr;
    }
    return g_TestCmdTree;
}

static mxml_node_t *find_group(mxml_node_t *tree, const char *groupname)
{
    return mxmlFindElement(tree, tree, "CmdGroup", "name", groupname, MXML_DESCEND);
}

/* Bounded by the tree, not by the group: an item that the group lacks is taken
   from a group after it. Agents address items so; do not confine it. */
static mxml_node_t *find_item(mxml_node_t *tree, mxml_node_t *group, const char *itemname)
{
    return mxmlFindElement(group, tree, "Cmd", "name", itemname, MXML_DESCEND);
}

static int my_mxmlGetNodeIdx(const mxml_node_t *node)
{
    int index = 0;

    /* the accessor takes no constant node, but does not change it */
    mxml_node_t *previous = mxmlGetPrevSibling(const_cast<mxml_node_t *>(node));
    while (previous != nullptr) {
        ++index;
        previous = mxmlGetPrevSibling(previous);
    }
    return index;
}

static int get_node_index(const char *groupname, const char *inodename, int /* level */)
{
    LOG("enter...\n");
    mxml_node_t *tree = load_configs_file(kPlanPath);
    if (tree == nullptr) {
        LOG_PLACE(":load config file failed\n");
        return -1;
    }
    mxml_node_t *group = find_group(tree, groupname);
    if (group == nullptr) {
        LOG_PLACE(":mxml Find Path failed\n");
        return -1;
    }
    mxml_node_t *item = find_item(tree, group, inodename);
    if (item == nullptr) {
        LOG_PLACE(":mxml Find Path failed\n");
        return -1;
    }
    return my_mxmlGetNodeIdx(item);
}

static mxml_node_t *get_node_byIndex(mxml_node_t *tree, const char *groupname, int nodeindex)
{
    LOG("enter...\n");
    if (tree == nullptr) {
        LOG_PLACE(":load config file failed\n");
        return nullptr;
    }
    mxml_node_t *group = find_group(tree, groupname);
    if (group == nullptr) {
        LOG_PLACE(": Find Element \"registers\" failed\n");
        return nullptr;
    }
    /* the first item, of whatever group: a group without one yields the next's */
    mxml_node_t *node = mxmlFindElement(group, tree, "Cmd", nullptr, nullptr, MXML_DESCEND);
    for (int counter = 0; node != nullptr && counter != nodeindex; ++counter) {
        node = mxmlGetNextSibling(node);
    }
    LOG("curernt leaf node name = %s\n", shown(mxmlElementGetAttr(node, "name")));
    LOG("leave...\n");
    return node;
}

static int get_node_length(const char *nodename, int level)
{
    LOG("Enter node length calculate!\n");
    LOG("input level = %d\n", level);
    mxml_node_t *tree = load_configs_file(kPlanPath);
    if (tree == nullptr) {
        LOG_PLACE(":load config file failed\n");
        return -1;
    }
    mxml_node_t *group = find_group(tree, nodename);
    if (group == nullptr) {
        LOG_PLACE(":mxml Find Path failed\n");
        return -1;
    }
    int length = 0;
    for (mxml_node_t *child = mxmlGetFirstChild(group); child != nullptr;
         child = mxmlGetNextSibling(child)) {
        ++length;
    }
    LOG("node length = %d!\n", length);
    return length;
}

static const char *indentation(mxml_node_t *node)
{
    static const char kTabs[] = "\t\t\t\t\t\t\t\t";
    const int deepest = (int)sizeof kTabs - 1;
    int level = -1;

    for (mxml_node_t *up = mxmlGetParent(node); up != nullptr && level < deepest;
         up = mxmlGetParent(up)) {
        ++level;
    }
    if (level < 0) {
        level = 0;
    }
    return kTabs + deepest - level;
}

static const char *whitespace_cb(mxml_node_t *node, int where)
{
    const char *name = mxmlGetElement(node);

    if (name != nullptr && strncmp(name, "?xml", 4) == 0) {
        return where == MXML_WS_AFTER_OPEN ? "\n" : nullptr;
    }
    switch (where) {
    case MXML_WS_BEFORE_OPEN:
        return indentation(node);
    case MXML_WS_AFTER_OPEN:
    case MXML_WS_AFTER_CLOSE:
        return "\n";
    default: /* closing tags are never indented */
        return nullptr;
    }
}

static void save_XmlFile(mxml_node_t *tree)
{
    LOG("enter...\n");
    const int fd = open(kPlanPath, O_RDWR | O_CREAT | O_TRUNC | O_SYNC, 0666);
    if (fd <= 0) { /* 0 is a failure to every reader of the plan */
        const int error = errno;
        LOG("Open %s file failed(%d),%s\n", kPlanPath, error, strerror(error));
        return;
    }
    mxmlSaveFd(tree, fd, whitespace_cb);
    close(fd);
    LOG("leave...\n");
}

/* --- recording ----------------------------------------------------------- */

/* Other codes have no text: the attribute then stays without a value. */
static const char *result_text(int iresult)
{
    switch (iresult) {
    case 0:
        return "0";
    case 1:
        return "1";
    case -2:
        return "-2";
    default:
        return nullptr;
    }
}

static void updateSrcXmlFile(const char *groupname, const char *inodename, int iresult,
                             const char *iDesc, int iprogress)
{
    char tmp[11];

    LOG("enter... !\n");
    mxml_node_t *tree = load_configs_file(kPlanPath);
    if (tree == nullptr) {
        LOG_PLACE(":load config file failed\n");
        return;
    }
    mxml_node_t *group = find_group(tree, groupname);
    if (group == nullptr) {
        LOG_PLACE(":mxml Find Path failed\n");
        return;
    }
    mxml_node_t *item = find_item(tree, group, inodename);
    if (item == nullptr) {
        LOG_PLACE(":mxml Find Path failed\n");
        return;
    }
    LOG("curernt node name is: %s\n", shown(mxmlElementGetAttr(item, "name")));

    LOG("start update progress!\n");
    format_text(tmp, 10, "%d", iprogress); /* readers expect at most 9 characters */
    mxmlElementSetAttr(item, "progress", tmp);

    LOG("start update result!\n");
    mxmlElementSetAttr(item, "result", result_text(iresult));

    LOG("start update description!\n");
    mxmlElementSetAttr(item, "description", iDesc);

    LOG("start save xml!\n");
    save_XmlFile(tree);
    /* logged even if the save failed: it marks the end, not success */
    LOG("update Src Xml File success . leave...\n");
}

int FPTEST_SetTransation(const char *iGroupname, const char *iNodename, int iProgress, int iResult,
                         const char *iDesc)
{
    LOG("enter...\n");
    LOG("input node name = %s\n", shown(iNodename));
    const int at = get_node_index(iGroupname, iNodename, 3);
    LOG("iResult = %d\n", iResult);
    LOG("index=%d - iResult=%d - iProgress=%d - iDesc=%s\n", at, iResult, iProgress, shown(iDesc));

    updateSrcXmlFile(iGroupname, iNodename, iResult, iDesc, iProgress);
    LOG("leave...\n");
    return 0;
}

/* --- read-back ----------------------------------------------------------- */

/* A negative size would make read() fail; the caller must instead learn that
   there was something to read. So one byte is read aside, and the assertion
   fires if there is data. */
static int read_piece(int fd, char *place, int room)
{
    char aside;

    if (room < 0) {
        return (int)read(fd, &aside, 1);
    }
    return (int)read(fd, place, (size_t)room);
}

void FPTEST_ExtractResultMsg(char *o_rst, int olen)
{
    LOG("enter... !\n");
    const int fd = open(kPlanPath, O_RDONLY);
    if (fd <= 0) { /* 0 is a failure to every reader of the plan */
        LOG("Open %s file failed!\n", kPlanPath);
        return;
    }
    LOG("offset = %d", (int)lseek(fd, 0, SEEK_CUR));
    LOG("offset = %d", (int)lseek(fd, 0, SEEK_END));
    LOG("offset = %d", (int)lseek(fd, 0, SEEK_SET));

    int total = 0;
    for (;;) {
        const int n = read_piece(fd, o_rst + total, olen - total);
        if (n == -1) { /* tried again without end: the agent waits for its plan */
            LOG_PLACE(":read file failed\n");
            continue;
        }
        if (n == 0) {
            break;
        }
        if (n > olen) {
            assert(0);
        }
        total += n;
        LOG("read file unfinish, continue... n = %d \n", n);
    }
    LOG("reach the end of file\n");
    LOG("read byte count = %d\n", total);
    close(fd);
    LOG("leave...\n");
}

/* --- launcher ------------------------------------------------------------ */

/* As system(), but it does not wait: the gatherer must outlive the call, to be
   triggered again. Its child is looked at once and never waited for later:
   reaping is the host's, which knows when it can. */
static int mysystem(const char *command)
{
    const char *argp[4] = {"sh", "-c", nullptr, nullptr};
    sigset_t mask;
    sigset_t omask;
    int pstat = 0;

    if (command == nullptr) {
        return 1;
    }
    argp[2] = command;
    sigemptyset(&mask);
    sigaddset(&mask, SIGCHLD);
    if (sigprocmask(SIG_BLOCK, &mask, &omask) == -1) {
        return -1; /* nothing is started without a mask to put back */
    }
    const pid_t pid = vfork();
    if (pid == -1) {
        sigprocmask(SIG_SETMASK, &omask, nullptr);
        return -1;
    }
    if (pid == 0) { /* on the parent's memory: call nothing else, write nothing */
        sigprocmask(SIG_SETMASK, &omask, nullptr);
        execve("/system/bin/sh", const_cast<char *const *>(argp), environ);
        _exit(127);
    }
    void (*intsave)(int) = signal(SIGINT, SIG_IGN);
    void (*quitsave)(int) = signal(SIGQUIT, SIG_IGN);
    const pid_t waited = waitpid(pid, &pstat, WNOHANG);
    sigprocmask(SIG_SETMASK, &omask, nullptr);
    signal(SIGINT, intsave);
    signal(SIGQUIT, quitsave);
    return waited == -1 ? -1 : pstat;
}

/* --- trigger ------------------------------------------------------------- */

/* Tells one gatherer to gather again. The connection is not closed: leaving is
   the gatherer's to do. Nor is a listening socket whose accept failed, so that
   the failure can be looked into; the next call makes its own. */
static void Sock_Init1(void)
{
    int opt = 1;

    sServer = socket(AF_INET, SOCK_STREAM, 0);
    memset(&addrServ, 0, sizeof addrServ);
    addrServ.sin_port = 0x8888; /* 34952 in either byte order */
    addrServ.sin_family = AF_INET;
    Setsockopt(sServer, &opt);
    Bind(sServer, (struct sockaddr *)&addrServ, (socklen_t)sizeof addrServ);
    if (listen(sServer, 5) < 0) { /* the accept tells what it comes to */
        const int error = errno;
        LOG("listen error");
        LOG("errno=%d", error);
    }
    socklen_t addrClientlen = (socklen_t)sizeof addrClie;
    const int Acce = Accept(sServer, (struct sockaddr *)&addrClie, &addrClientlen);
    if (Acce < 0) {
        const int error = errno;
        LOG("accept error!\n");
        LOG("errno=%d", error);
        return;
    }
    memset(sendBuf, 0, 32);
    copy_text(sendBuf, 32, "gather again!");
    const int retWri = (int)write(Acce, sendBuf, strlen(sendBuf));
    const int error = errno;
    LOG("retWri=%d", retWri);
    if (retWri < 0) {
        LOG("retWri error");
        LOG("errno=%d", error);
    }
    LOG("retWri success\n"); /* said after a failed write too: it ends the trigger */
    close(sServer);
}

/* --- item execution ------------------------------------------------------ */

/* 1 when a gatherer runs, under any vendor's name; 0 when none does; -1 when
   that could not be asked. */
static int ResourceReduce(void)
{
    static const char cbuf[] = "ps | grep /system/bin/SensorProbe";
    char tbuf[129] = {0};
    int row = 0;

    LOG("\ncbuf=%s\n", cbuf);
    FILE *query = popen(cbuf, "r");
    if (query == nullptr) {
        LOG("popen error!\n");
        return -1;
    }
    if (fgets(tbuf, (int)sizeof tbuf, query) != nullptr) {
        LOG("\ntbuf=%s\n", tbuf);
        row = 1;
    } else {
        LOG("target process not exist!\n");
    }
    pclose(query);
    return row;
}

static void read_vendor(void)
{
    char tmp[65] = {0};

    get_node_value(kParameterFile, kVendorParameter, tmp, sizeof tmp - 1);
    vendor = (int32_t)strtol(tmp, nullptr, 10);
    printf("vendor = %d\n", vendor);
}

static void SingleItemExecute(mxml_node_t *tree, const char *groupname, int index)
{
    char tpCmd[1025] = {0};
    char tLine[1025] = {0};
    char tCompare[1025] = "SensorProbe";
    char tCompare_ca[1025] = "SensorProbe_ca";
    char tCompare_qsee[1025] = "SensorProbe_qsee";
    char rootPath[65] = {0};
    const char *gatherer;

    LOG("enter... !\n");
    read_vendor();

    mxml_node_t *node = get_node_byIndex(tree, groupname, index);
    if (node == nullptr) {
        LOG("get node by Index fail!\n");
        return;
    }
    const char *tName = mxmlElementGetAttr(node, "name");
    const char *tArg = mxmlElementGetAttr(node, "args");
    LOG("mxmlElementGetAttr name=%s- args=%s\n", shown(tName), shown(tArg));
    if (tName == nullptr || tName[0] == '\0') {
        LOG("current node is null !\n");
        return;
    }
    copy_text(tLine, 1024, tName);
    ExtractString(tLine, 1024);
    /* not emptied before, since all of it is filled: a suspension may read it at
       any moment, and an empty name would stop the first process of the system */
    copy_text(g_CmdName, sizeof g_CmdName, tLine);

    const int row = ResourceReduce();
    copy_text(rootPath, 64, "/system/bin");

    switch (vendor) {
    case 0:
        gatherer = tCompare;
        break;
    case 1:
        append_text(tLine, sizeof tLine, "_ca");
        LOG("tLine:%s\n", tLine);
        gatherer = tCompare_ca;
        break;
    case 2:
        /* suffix and name differ on purpose, and so are never equal: under this
           vendor the gatherer is an ordinary item */
        append_text(tLine, sizeof tLine, "_ca_qsee");
        LOG("tLine:%s\n", tLine);
        gatherer = tCompare_qsee;
        break;
    default:
        LOG("More than one vendor, Setting error!\n");
        return;
    }
    if (strcmp(tLine, gatherer) != 0) {
        format_text(tpCmd, sizeof tpCmd, "%s/%s %s", rootPath, tLine, shown(tArg));
        LOG("tpCmd:%s\n", tpCmd);
        [[maybe_unused]] const int ended = system(tpCmd);
        LOG("leave... !\n");
        return;
    }
    format_text(tpCmd, sizeof tpCmd, "%s/%s %s", rootPath, gatherer, shown(tArg));
    LOG("tpCmd:%s\n", tpCmd);
    LOG("\nrow=%d\n", row);
    if (row == 1) {
        Sock_Init1();
        return;
    }
    mysystem(tpCmd);
    Sock_Init1();
    LOG("leave... !\n");
}

/* --- suspension ---------------------------------------------------------- */

/* The listing's stream is not closed on any path: that would wait for ps to
   end, however many processes it still has to list, and a stop is urgent. */
int FPTEST_SuspendItemExecute(void)
{
    const char seps[2] = " ";
    char cbuf[33] = {0};
    char sbuf[33] = {0};
    char tbuf[513] = {0};

    LOG("enter... !\n");
    format_text(cbuf, 32, "%s %s", "ps", g_CmdName);
    FILE *pp = popen(cbuf, "r");
    if (pp == nullptr) {
        LOG("popen error!\n");
        return -1;
    }
    if (fgets(tbuf, (int)sizeof tbuf, pp) == nullptr) { /* the header */
        LOG("target process not exist!\n");
        return -1;
    }
    memset(tbuf, 0, sizeof tbuf);
    if (fgets(tbuf, (int)sizeof tbuf, pp) == nullptr) {
        LOG("target process not exist!\n");
        return -1;
    }
    const char *token = strtok(tbuf, seps);
    if (token != nullptr) {
        token = strtok(nullptr, seps);
        if (token != nullptr) {
            LOG("pid = %s\n", token);
        }
    }
    /* no dash before the 9, and none to be put there: a standard kill takes it
       for a process id and sends both the default signal, which lets an item
       put its sensor to rest as signal 9 would not */
    format_text(sbuf, 32, "%s %s", "kill 9", shown(token));
    mysystem(sbuf);
    return 0;
}

/* --- node paths ---------------------------------------------------------- */

/* Counts the components of a path; ostr receives the last one, for the log. A
   copy that cannot be had counts as an empty path. */
static int get_node_level(const char *ins, char *ostr, int olen)
{
    char tmp[33] = {0};
    int level = 0;
    char *copy = nullptr;

    if (strchr(ins, '/') != nullptr) {
        copy = strdup(ins);
    }
    if (copy == nullptr) {
        copy_text(ostr, (size_t)olen, ins);
        level = 1;
    } else {
        for (const char *token = strtok(copy, "/"); token != nullptr;
             token = strtok(nullptr, "/")) {
            copy_text(tmp, sizeof tmp, token);
            ++level;
        }
        free(copy);
    }
    LOG("level = %d\n", level);
    ExtractString(tmp, 32);
    LOG("node name = %s\n", tmp);
    /* in this order: a path without '/' names no node, and ends as an empty one */
    copy_text(ostr, (size_t)olen, tmp);
    return level;
}

static void get_node_name(char *cmdline, char *midnodename, int midlen, char *lefnodename,
                          int leaflen)
{
    int component = 0;

    LOG("enter...\n");
    for (const char *token = strtok(cmdline, "/"); token != nullptr; token = strtok(nullptr, "/")) {
        switch (component) {
        case 0: /* any root will do */
            LOG("root node:%s\n", token);
            break;
        case 1:
            LOG("mid node:%s\n", token);
            copy_text(midnodename, (size_t)midlen, token);
            break;
        case 2:
            LOG("leaf node:%s\n", token);
            copy_text(lefnodename, (size_t)leaflen, token);
            break;
        default:
            break;
        }
        ++component;
    }
}

static int fptest_ItemsTest(char *cmdline, char * /* rstcmd */)
{
    char midnodename[65] = {0};
    char leafnodename[65] = {0};
    char lastnodename[65] = {0};

    LOG("Input cmdline : %s\n", cmdline);
    const int level = get_node_level(cmdline, lastnodename, 64);
    if (level == 1) {
        return 0;
    }
    get_node_name(cmdline, midnodename, 64, leafnodename, 64);
    if (level == 2) {
        const int count = get_node_length(midnodename, 2);
        for (int index = 0; index < count; ++index) {
            SingleItemExecute(g_TestCmdTree, midnodename, index);
        }
        return 0;
    }
    /* passed on untested: a failed lookup is told by the run that fails */
    const int index = get_node_index(midnodename, leafnodename, 3);
    SingleItemExecute(g_TestCmdTree, midnodename, index);
    return 0;
}

/* --- command entry ------------------------------------------------------- */

static void TestMsgInit(fpTest_TestMsg_t *imsg)
{
    memset(imsg->testMsgHead, 0, sizeof imsg->testMsgHead);
    memset(imsg->testMsgName, 0, sizeof imsg->testMsgName);
    memset(imsg->testMsgArgs, 0, sizeof imsg->testMsgArgs);
}

/* Any run of colons separates, so no field can hold one and a plan is cut at
   its first: that is the protocol, and senders know it. */
static void fptest_ParseCmdLine(const char *iCmdStr, fpTest_TestMsg_t *iptmsg)
{
    static const char kSeparators[] = "::";
    int field = 0;

    char *copy = iCmdStr != nullptr ? strdup(iCmdStr) : nullptr;
    if (copy == nullptr) {
        return;
    }
    for (const char *token = strtok(copy, kSeparators); token != nullptr;
         token = strtok(nullptr, kSeparators)) {
        switch (field) {
        case 0:
            LOG("testHead is : %s\n", token);
            copy_text(iptmsg->testMsgHead, sizeof iptmsg->testMsgHead, token);
            break;
        case 1:
            LOG("testName is : %s\n", token);
            copy_text(iptmsg->testMsgName, sizeof iptmsg->testMsgName, token);
            break;
        case 2:
            LOG("testArgs is : %s\n", token);
            copy_text(iptmsg->testMsgArgs, sizeof iptmsg->testMsgArgs, token);
            break;
        default:
            break;
        }
        ++field;
    }
    free(copy);
}

/* The descriptor is not closed: what a call leaves in the host's descriptor
   table is part of the interface, one for each stored plan. */
static int saveRecvFile(const char *filename, const char *data, int len)
{
    remove(filename);
    const int fd = open(filename, O_RDWR | O_CREAT, 0666);
    if (fd < 0) { /* 0 will do: a plan that has come is not to be lost */
        LOG("OPEN FILE FAIL!\n");
        return -1;
    }
    mxmlDelete(g_TestCmdTree);
    g_TestCmdTree = nullptr;
    if (write(fd, data, (size_t)len) != len) {
        LOG("WRITE DATA FAIL!\n");
        return -1;
    }
    return 0;
}

int FPTEST_RunTestCmd(const char *ibuff, char *obuff, int olen)
{
    /* nothing fills it: results go back in the plan, and agents rely on the reply
       of a run being there and empty */
    char tResBuf[1025] = {0};
    fpTest_TestMsg_t msg;

    TestMsgInit(&msg);
    fptest_ParseCmdLine(ibuff, &msg);

    /* only the first ping is answered: a reply tells the service that it talks to
       a process that has just been started */
    if (g_PingMask == 0 && strncmp(msg.testMsgHead, "pingtest", 8) == 0) {
        LOG("Get ping reply success!\n");
        if (obuff != nullptr) {
            copy_text(obuff, (size_t)olen, "Ping Success!");
        }
        g_PingMask = 1;
        return 0;
    }
    if (strncmp(msg.testMsgHead, "XMLFile", 7) == 0) {
        saveRecvFile(kPlanPath, msg.testMsgName, (int)strlen(msg.testMsgName));
        /* said whatever became of the store: it ends the command in the log, and
           does not judge it */
        LOG("Save source xml file success!\n");
        return 0;
    }
    if (strncmp(msg.testMsgHead, "XMLNodePath", 11) == 0) {
        ExtractString(msg.testMsgName, 2048);
        fptest_ItemsTest(msg.testMsgName, tResBuf);
        if (obuff != nullptr) {
            copy_text(obuff, (size_t)olen, tResBuf);
        }
    }
    return 0;
}
