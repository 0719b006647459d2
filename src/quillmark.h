/*
 * SPDX-FileCopyrightText: 2026 The Quillmark authors
 * SPDX-License-Identifier: Apache-2.0
 */

/*
 * Quillmark: lets a remote test service drive the tests of a fingerprint-sensor
 * stack on the device that loads this library.
 *
 * A host agent passes command strings to FPTEST_RunTestCmd: one stores a test
 * plan (XML), others run a group or one item of it. Items report through
 * FPTEST_SetTransation, usually from processes of their own; the agent reads
 * the annotated plan back with FPTEST_ExtractResultMsg and may stop the item
 * last started with FPTEST_SuspendItemExecute.
 *
 * Calls must not overlap: the library takes no locks and splits its strings
 * with strtok, so nothing else in the process may be inside strtok either while
 * a call runs. The one exception is FPTEST_SuspendItemExecute, which another
 * thread may call while FPTEST_RunTestCmd is blocked running an item.
 *
 * No function returns what became of its job: that is written to the platform's
 * log (vr_log_printf, tag "VRCODE"), a line for each step. On Linux it goes to
 * standard error, or into the file that the variable VR_LOG_FILE names. The only
 * line on standard output is "vendor = N", once for each item run.
 *
 * While the library starts something, SIGINT and SIGQUIT are ignored. A
 * suspension that meets the end of the item it wanted to stop may leave them
 * so; a host that depends on its own handlers sets them again after one. A host
 * should ignore SIGPIPE, because the gatherer is told by a plain write.
 *
 * The library asks the first ps in PATH. Android's own finds the gatherer up to
 * Android 7, and the item to stop up to 5.1, if its name has at most 15
 * characters; no ps finds what /proc hides. So a host on a device puts first in
 * its PATH the directory with quillmark-ps, which is installed as
 * LIBEXECDIR/quillmark/bin/ps.
 *
 * The C library's shell runs the items. For a host in /vendor/bin that is
 * /vendor/bin/sh on Android 9 to 13; if it is missing, no item but the gatherer
 * runs, and nothing says so.
 */
#ifndef QUILLMARK_H
#define QUILLMARK_H

#include <mxml.h>

#ifdef __cplusplus
extern "C" {
#endif

#define QUILLMARK_API __attribute__((visibility("default")))

/* A command string, parsed. Every field is zero-terminated. */
typedef struct {
    char testMsgHead[32];   /* at most 31 characters */
    char testMsgName[2049]; /* at most 2048: the test plan, or the node path */
    char testMsgArgs[1024]; /* at most 1023: logged, used by no command */
} fpTest_TestMsg_t;

/*
 * The top node of the cached test plan, or null while none is loaded. It
 * belongs to the library, which loads it when a call first needs it and deletes
 * it when a new plan is stored. Look, but do not change or delete it, and do
 * not keep a node of it across an "XMLFile" command.
 */
extern QUILLMARK_API mxml_node_t *g_TestCmdTree;

/*
 * Runs one command and returns when everything it started has ended (or, for
 * the gatherer, has been told to gather).
 *
 * ibuff  the command, zero-terminated: HEAD::NAME::ARGUMENTS. Any run of colons
 *        separates two fields, so no field can contain one. The text stays the
 *        caller's and is not changed. Null counts as an empty command.
 * obuff  the caller's reply buffer, or null for no reply
 * olen   its capacity in bytes, at least 1 unless obuff is null; it is trusted
 *
 * Heads, which match as prefixes:
 *   pingtest     the first one of the process replies "Ping Success!"; later
 *                ones do nothing
 *   XMLFile      stores NAME, cut to 2048 bytes, as /data/vorlane/src1.xml and
 *                drops the cached plan. The file's descriptor stays open, one
 *                for each stored plan. Where the file cannot be opened the old
 *                one is gone all the same, and the cached plan stays in use. No
 *                reply.
 *   XMLNodePath  NAME is root/group (run every item of the group, in order) or
 *                root/group/item (run that one); anything shorter runs nothing,
 *                and what is after the item or a tab or line feed is
 *                ignored. Names hold at most 63 characters; the root is not
 *                compared. An item that the group lacks is looked for in the
 *                groups after it, and its position there is run here. Replies
 *                an empty text: all olen bytes become zero.
 * Any other head does nothing.
 *
 * An item runs as "/system/bin/NAME ARGS" with the vendor's suffix after its
 * name, cut to 1024 characters; its name is cut at its first tab or line feed
 * and to 1023 characters, suffix included 1024. Attributes name and args come
 * from the plan; a missing args reads "(null)".
 *
 * A reply longer than olen - 1 bytes is cut, and the rest of the buffer is
 * filled with zeros.
 *
 * Returns 0 always. Logged: the fields of the command, what was looked up,
 * found and started, and failures to store, open or find something, to ask for
 * the gatherer, to listen, accept or send. Not logged: how a program ended, or
 * whether there was one.
 */
QUILLMARK_API int FPTEST_RunTestCmd(const char *ibuff, char *obuff, int olen);

/*
 * Writes an item's progress, result and description into the test plan and
 * saves the plan. Loads the plan first if this process has not yet done so; a
 * process keeps its own copy and saves the whole of it, so what other processes
 * have saved since is overwritten.
 *
 * iGroupname  name of the item's CmdGroup; not null
 * iNodename   name of the item; not null. An item that the group lacks is
 *             looked for in the groups after it.
 * iProgress   written in decimal, cut to its first 9 characters
 * iResult     0, 1 or -2; any other value leaves the attribute without a value
 * iDesc       text of any length, copied; null leaves the attribute without a
 *             value. Not a text of g_TestCmdTree itself.
 *
 * Mini-XML refuses to load a file that holds an attribute without a value.
 *
 * Returns 0 always. Logged: the values, and a failure to load the plan, to find
 * the item or to open the file; "success" is logged even when the file could
 * not be opened, in which case the change stays in this process and is written
 * by its next report that can be, unless a new plan is stored before.
 */
QUILLMARK_API int FPTEST_SetTransation(const char *iGroupname, const char *iNodename, int iProgress,
                                       int iResult, const char *iDesc);

/*
 * Copies the stored test plan, as it is in the file, into the caller's buffer.
 *
 * o_rst  the caller's buffer; no terminating zero is written, and the bytes
 *        after the text are left as they were, so clear it before the call
 * olen   its capacity in bytes; a longer file is cut there. A negative value
 *        ends the process with an assertion if there is anything to read.
 *
 * Logged: the file's size, the bytes read, and a failure to open the file,
 * which leaves the buffer untouched. A read that fails is tried again without
 * end.
 */
QUILLMARK_API void FPTEST_ExtractResultMsg(char *o_rst, int olen);

/*
 * Stops the item last started: asks ps for the first 28 characters of its name,
 * without the vendor's suffix, and runs "kill 9 PID" for the first process
 * listed, in the background. The 9 is read as a second process id, so process 9
 * gets the same signal. Before any item was started the first process of the
 * system is the one listed. Each call leaves the listing's descriptor open, and
 * ps and the shell of the kill as finished children.
 *
 * May be called from another thread while FPTEST_RunTestCmd runs an item.
 *
 * Returns 0 when the kill command was run, whatever became of it, and -1 when
 * ps could not be started or listed no process. Logged: the process id, or the
 * failure.
 */
QUILLMARK_API int FPTEST_SuspendItemExecute(void);

#ifdef __cplusplus
}
#endif

#endif
