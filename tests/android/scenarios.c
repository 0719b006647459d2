/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/*
 * A host agent that goes through every exported function, and the items that it runs:
 * under its own name the host, under any other an item. It prints what became of each
 * scenario: replies, the plan's file, the log. Process ids and line lengths that hang on
 * them aside, that is the same on every C library: scripts/test-android compares it.
 *
 * usage: scenarios             runs all of them, in /data/vorlane, with VR_LOG_FILE set
 *        ITEM [report GROUP PROGRESS RESULT DESCRIPTION | stay]
 */
#include "quillmark.h"

#include <arpa/inet.h>
#include <ctype.h>
#include <netinet/in.h>
#include <pthread.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#define PLAN "/data/vorlane/src1.xml"
#define NOTES "/data/vorlane/notes"
#define PARAMETERS "/etc/vorlane/sysparms/vr_common_cfg.xml"

static void write_file(const char *path, const char *mode, const char *text)
{
    FILE *file = fopen(path, mode);

    if (file == NULL || fputs(text, file) < 0 || fclose(file) != 0) {
        perror(path);
        exit(1);
    }
}

static void nap(void)
{
    usleep(10000);
}

/* ---- items ------------------------------------------------------------------- */

/* Connects whenever the library listens, and notes what it is told. */
static void gather(void)
{
    for (;; nap()) {
        char text[32] = "";
        struct sockaddr_in library = {.sin_family = AF_INET, .sin_port = htons(34952)};
        const int connection = socket(AF_INET, SOCK_STREAM, 0);

        library.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        if (connect(connection, (const struct sockaddr *)&library, sizeof library) == 0 &&
            read(connection, text, sizeof text - 1) > 0) {
            strcat(text, "\n");
            write_file(NOTES, "a", text);
        }
        close(connection);
    }
}

static int be_item(int count, char **words)
{
    if (strstr(words[0], "SensorProbe") != NULL && strchr(words[0], '_') == NULL) {
        gather();
    }
    for (int i = 0; i < count; i++) {
        write_file(NOTES, "a", words[i]);
        write_file(NOTES, "a", i + 1 < count ? "|" : "\n");
    }
    if (count == 6 && strcmp(words[1], "report") == 0) {
        const char *name = strrchr(words[0], '/');
        return FPTEST_SetTransation(words[2], name != NULL ? name + 1 : words[0], atoi(words[3]),
                                    atoi(words[4]), words[5]);
    }
    if (count == 2 && strcmp(words[1], "stay") == 0) {
        sleep(60);
    }
    return 0;
}

/* ---- what became of a scenario ----------------------------------------------- */

static void show(const char *text, size_t length)
{
    for (size_t i = 0; i < length; i++) {
        const unsigned char byte = (unsigned char)text[i];
        printf(byte == '\n' || isprint(byte) ? "%c" : "<%02x>", byte);
    }
}

static void show_file(const char *what, const char *path)
{
    static char text[1 << 20];
    FILE *file = fopen(path, "r");
    const size_t length = file != NULL ? fread(text, 1, sizeof text, file) : 0;

    printf("%s%s\n", what, file != NULL ? "" : " (none)");
    show(text, length);
    if (file != NULL) {
        fclose(file);
    }
}

static void scenario(const char *name)
{
    static const char *current;

    if (current != NULL) {
        show_file("-- plan", PLAN);
        show_file("\n-- notes", NOTES);
        show_file("-- log", getenv("VR_LOG_FILE"));
    }
    unlink(NOTES);
    if (truncate(getenv("VR_LOG_FILE"), 0) != 0 && current != NULL) {
        perror("the log");
    }
    current = name;
    printf("== %s\n", name);
}

static void run(const char *command, int capacity)
{
    char reply[64];

    memset(reply, '#', sizeof reply);
    const int code = FPTEST_RunTestCmd(command, capacity < 0 ? NULL : reply, capacity);
    printf("%d <", code);
    show(reply, sizeof reply);
    puts(">");
}

static void store(const char *plan)
{
    char command[8192];

    snprintf(command, sizeof command, "XMLFile::%s::arguments", plan);
    run(command, 8);
}

static void read_back(int capacity)
{
    char text[4096];

    memset(text, '#', sizeof text);
    FPTEST_ExtractResultMsg(text, capacity);
    printf("read back %d: ", capacity);
    show(text, capacity < 0 ? 0 : (size_t)capacity + 4);
    puts("");
}

/* Waits until a file has so many lines. */
static void wait_for_notes(int lines)
{
    for (int tries = 0; tries < 3000; tries++, nap()) {
        FILE *file = fopen(NOTES, "r");
        int found = 0;

        for (int c; file != NULL && (c = getc(file)) != EOF;) {
            found += c == '\n';
        }
        if (file != NULL) {
            fclose(file);
        }
        if (found >= lines) {
            return;
        }
    }
    printf("no %d notes\n", lines);
}

/* ---- the scenarios ----------------------------------------------------------- */

static void *run_long_item(void *unused)
{
    run("XMLNodePath::plan/Group/AnItemWithAVeryLongName", 8);
    return unused;
}

static void set_vendor(const char *vendor)
{
    char text[256];

    snprintf(text, sizeof text,
             "<?xml version=\"1.0\"?><device><SysParam><Quillmark><vendor>%s</vendor>"
             "</Quillmark></SysParam></device>",
             vendor);
    write_file(PARAMETERS, "w", text);
}

static void negative_capacity(void)
{
    int status = 0;

    fflush(stdout);
    const pid_t child = fork();
    if (child == 0) {
        read_back(-1);
        _exit(0);
    }
    waitpid(child, &status, 0);
    printf("ended by signal %d\n", WIFSIGNALED(status) ? WTERMSIG(status) : 0);
}

static void run_all(void)
{
    static const char kPlan[] =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plan>\n"
        " <CmdGroup name=\"Group\">\n  <Cmd name=\"First\" args=\"one 'two three'\"/>\n"
        "  <Cmd name=\"Second\" args=\"report Group 100 0 'all &amp; well'\"/>\n"
        "  <Cmd name=\"Third\"/>\n"
        "  <Cmd name=\"SensorProbe\" args=\"\"/>\n"
        "  <Cmd name=\"AnItemWithAVeryLongName\" args=\"stay\"/>\n </CmdGroup>\n"
        " <CmdGroup name=\"Other\"><Cmd name=\"Fourth\" args=\"report Other 40 -2 'not yet'\"/>"
        "</CmdGroup>\n</plan>\n";
    static char text[4096];

    scenario("before there is a plan");
    run("XMLNodePath::plan/Group", 8);
    read_back(16);
    printf("%d\n", FPTEST_SetTransation("Group", "First", 1, 0, "text"));

    scenario("pings, and replies that are cut");
    run("pingtest::a::b", 6);
    run("pingtest", 64);

    scenario("null and empty texts");
    run(NULL, 8);
    run("", -1);
    run(":::", 1);
    run("unknown::name::arguments", 8);

    scenario("a plan, its items and groups");
    store(kPlan);
    run("XMLNodePath::plan/Group/First", 8);
    run("XMLNodePath::plan/Group/Second", 8);
    run("XMLNodePath::plan/Group/Third", 8);
    run("XMLNodePath::plan/Group/Fourth", 8);
    run("XMLNodePath::plan/Other", 8);
    run("XMLNodePath::plan/None", 8);
    run("XMLNodePath::plan/Group/None", 8);
    run("XMLNodePath::plan", 8);
    read_back(0);
    read_back(40);
    read_back(4000);

    scenario("reports");
    printf("%d\n",
           FPTEST_SetTransation("Group", "First", 2147483647, 1, "<\"caf\xc3\xa9\" & 'co'>"));
    printf("%d\n", FPTEST_SetTransation("Group", "Third", -2147483647, -2, ""));
    printf("%d\n", FPTEST_SetTransation("None", "First", 1, 0, "no group"));
    printf("%d\n", FPTEST_SetTransation("Group", "None", 1, 0, "no item"));
    memset(text, 'x', 3000);
    text[3000] = '\0';
    printf("%d\n", FPTEST_SetTransation("Group", "Fourth", 1, 0, text));

    scenario("a report without its texts");
    store(kPlan);
    printf("%d\n", FPTEST_SetTransation("Group", "First", 5, 7, NULL));
    run("XMLNodePath::plan/Group/First", 8);

    scenario("vendors");
    store(kPlan);
    static const char *const kVendors[] = {"0", "1", "2", "3", "-1", "12x", "", "99999999"};
    for (size_t i = 0; i < sizeof kVendors / sizeof *kVendors; i++) {
        set_vendor(kVendors[i]);
        run("XMLNodePath::plan/Group/First", 8);
    }
    unlink(PARAMETERS);

    scenario("broken plans");
    static const char *const kBroken[] = {
        "",
        "text",
        "<plan><CmdGroup name='Group'>",
        "<plan><CmdGroup name=Group><Cmd/></plan>",
        "<plan><CmdGroup name='Group'><Cmd name='First' args='&nothing;'/></CmdGroup></plan>",
        "<plan><CmdGroup><Cmd/></CmdGroup></plan>",
        "\x80\xff<plan/>"};
    for (size_t i = 0; i < sizeof kBroken / sizeof *kBroken; i++) {
        store(kBroken[i]);
        run("XMLNodePath::plan/Group/First", 8);
        read_back(64);
    }

    scenario("a plan that is cut, and one with colons");
    snprintf(text, sizeof text,
             "<plan><!-- %02000d --><CmdGroup name='Group'><Cmd name='First'/>"
             "</CmdGroup></plan>",
             0);
    store(text);
    run("XMLNodePath::plan/Group/First", 8);
    store("<plan><CmdGroup name='Group'><Cmd name='a::b'/></CmdGroup></plan>");
    run("XMLNodePath::plan/Group", 8);

    scenario("long names, arguments and paths");
    memset(text, 'n', sizeof text);
    char plan[8192];
    snprintf(plan, sizeof plan,
             "<plan><CmdGroup name='Group'><Cmd name='First' args='%.1200s'/>"
             "<Cmd name='%.63s' args='x'/></CmdGroup></plan>",
             text, text);
    store(plan);
    run("XMLNodePath::plan/Group", 8);
    snprintf(plan, sizeof plan, "XMLNodePath::plan/Group/%.70s", text);
    run(plan, 8);
    snprintf(plan, sizeof plan, "%.40s::plan::%.1100s", text, text);
    run(plan, 8);

    scenario("the gatherer, started and told, then told again");
    store(kPlan);
    run("XMLNodePath::plan/Group/SensorProbe", 8);
    wait_for_notes(1);
    run("XMLNodePath::plan/Group/SensorProbe", 8);
    wait_for_notes(2);

    scenario("a stop from a second thread, and one too late");
    store(kPlan);
    pthread_t thread;
    pthread_create(&thread, NULL, run_long_item, NULL);
    wait_for_notes(1);
    printf("stop: %d\n", FPTEST_SuspendItemExecute());
    pthread_join(thread, NULL);
    printf("stop: %d\n", FPTEST_SuspendItemExecute());

    scenario("a negative capacity");
    negative_capacity();
    store("");
    negative_capacity();

    scenario("the end");
    puts(g_TestCmdTree != NULL ? "a plan is loaded" : "no plan is loaded");
}

int main(int argc, char **argv)
{
    const char *name = strrchr(argv[0], '/');

    if (strcmp(name != NULL ? name + 1 : argv[0], "scenarios") != 0) {
        return be_item(argc, argv);
    }
    if (getenv("VR_LOG_FILE") == NULL) {
        fputs("scenarios: VR_LOG_FILE is not set\n", stderr);
        return 2;
    }
    signal(SIGPIPE, SIG_IGN);
    setvbuf(stdout, NULL, _IOLBF, 0);
    run_all();
    return 0;
}
