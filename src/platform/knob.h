/* SPDX-License-Identifier: Apache-2.0 */
/* The kernel's system-information node interface (KNOB): named nodes that are read and set, and
   the kernel's text for a status.

   Rules that hold for every function:
   1. A KNOB_ReturnStatus of 0 is success; every other value is a failure, and nothing has changed.
      knob_status.h names the values.
   2. Lists given to a call stay the caller's; a list handed out belongs to the caller, who
      destroys it with KNOB_ParamListDestroy.
   3. Texts are NUL-terminated bytes. A text that is added to a list is copied.
   4. Output buffers are untouched unless the result is 0.
   5. Nothing is printed and nothing is thrown. The functions may be called from any thread; one
      list is used by one thread at a time. */
#ifndef POOLCTL_PLATFORM_KNOB_H
#define POOLCTL_PLATFORM_KNOB_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef uint16_t KNOB_NodeID;
typedef uint32_t KNOB_ReturnStatus;
typedef struct KNOB_ParamList KNOB_ParamList;

/* Compares the signature of this library's interface with the running kernel's. 0: they match.
   Otherwise non-zero; runningBuild (of SIZE bytes, 21 hold every build date) then holds the
   kernel's build date, cut to fit, and *myBuild the library's own, which is never freed. */
int KNOB_CheckSig(char *runningBuild, int size, const char **myBuild);

/* Makes an empty list. kind: 0 for input arguments, 1 for instance arguments. capacity: how many
   entries it takes, 0 or more. Null: no memory, an unknown kind or a negative capacity. */
KNOB_ParamList *KNOB_ParamListCreate(int kind, int capacity);

/* Appends one entry. A null or a full list, or a null text, is a bad parameter and nothing is
   added. */
KNOB_ReturnStatus KNOB_ParamListAddInt(KNOB_ParamList *list, int64_t value);
KNOB_ReturnStatus KNOB_ParamListAddString(KNOB_ParamList *list, const char *text);

/* Frees a list; null is accepted. */
void KNOB_ParamListDestroy(KNOB_ParamList *list);

/* The number of entries of a list; 0 for null. */
int KNOB_ParamListNumInstances(const KNOB_ParamList *list);

/* Reads NODE into OUTPUT. instance: the list [group id], or null for a node of the whole machine.
   outputSize: in bytes, at least the record's. Returns 0, or: bad node, bad parameter (a wrong
   list), buffer size, not found, permission denied, kernel not usable. */
KNOB_ReturnStatus KNOB_Get(KNOB_NodeID node, const KNOB_ParamList *instance, void *output,
                           size_t outputSize);

/* Sets NODE. instance: the list [group id], or null where the node has no instance. input: the
   arguments, or null where it takes none. output: receives the node's result, or null and 0.
   Returns 0 or a status; a change is made whole or not at all. */
KNOB_ReturnStatus KNOB_Set(KNOB_NodeID node, const KNOB_ParamList *instance,
                           const KNOB_ParamList *input, void *output, size_t outputSize);

/* Hands out the instances of NODE below INSTANCE as a new list in *result, which the caller
   destroys. *result is untouched unless the status is 0. */
KNOB_ReturnStatus KNOB_GetInstanceListAlloc(KNOB_NodeID node, const KNOB_ParamList *instance,
                                            KNOB_ParamList **result);

/* A text for a status, in one line. For the status of the calling thread's last failed call the
   reason follows, as in "not found: host/opt/no". An unknown status has a text with its number.
   The text is valid until the thread asks for another one or makes another call. */
const char *NUC_ReturnStatusToString(KNOB_ReturnStatus status);

/* Facts of the machine (get, no instance). knob_records.h has the records. */
extern const KNOB_NodeID KNOB_NODE_hardware_cpu_cpuInfo; /* 38 bytes */
extern const KNOB_NodeID KNOB_NODE_system_vmLimits;      /* 32 bytes */
extern const KNOB_NodeID KNOB_NODE_system_bootCmdLine;   /* 4096 bytes, NUL-terminated */
extern const KNOB_NodeID KNOB_NODE_memory_comprehensive; /* 80 bytes */

/* Scheduler groups. An instance is the list [group id]. */
extern const KNOB_NodeID KNOB_NODE_sched_groupPathNameToID;  /* set: input [path], output id */
extern const KNOB_NodeID KNOB_NODE_sched_groups_groupCreate; /* set: input [name], output id */
extern const KNOB_NodeID KNOB_NODE_sched_groups_delete;      /* set: no input, no output */
extern const KNOB_NodeID KNOB_NODE_sched_groups_memAllocationInMB;  /* get 36 bytes; set */
extern const KNOB_NodeID KNOB_NODE_sched_groups_cpuAllocationInPct; /* get 20 bytes; set */
extern const KNOB_NodeID KNOB_NODE_sched_groups_members_groups;     /* instance list */
extern const KNOB_NodeID KNOB_NODE_sched_groups_members_worlds;     /* instance list; set: [pid] */
extern const KNOB_NodeID KNOB_NODE_sched_groups_stats_memoryStats;  /* get 382 bytes */

#ifdef __cplusplus
}
#endif

#endif
