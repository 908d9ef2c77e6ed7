/* SPDX-License-Identifier: Apache-2.0 */
/* For a test that is linked against the recording libknob instead of running a program with it. */
#pragma once

#ifdef __cplusplus
extern "C" {
#endif

/* Writes down what a program's end would (lists that are left over, the groups, END), and forgets
   everything: the next call reads the script that the environment then names. */
void RecordingKnobEnd(void);

#ifdef __cplusplus
}
#endif
