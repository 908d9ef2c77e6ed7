/* SPDX-License-Identifier: Apache-2.0 */
/* For a test that is itself linked with the recording libknob. */
#pragma once

#ifdef __cplusplus
extern "C" {
#endif

/* Does what happens at the end of a program (records left-over lists, the groups and END), and
   clears all state. The next call reads the script that the environment then names. */
void RecordingKnobEnd(void);

#ifdef __cplusplus
}
#endif
