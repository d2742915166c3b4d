/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_TESTS_CAMRECORDING_H
#define TSLAUTH_TESTS_CAMRECORDING_H

#include <tslauth/tslauth_cam_provider.h>

#ifdef __cplusplus
extern "C" {
#endif

enum { CAM_RECORDING_LOG = 4096 };

/* What cam-recording.c answers, and what was done to it. The library exports one, `camRecording`,
 * which a test finds with dlsym; loading it afresh empties it. For one thread at a time. */
typedef struct CAMRecording {
    /* Set by the test. Results are handed out also where `code` says failure. */
    int code;             /* of every entry, while `failingCall` is 0 */
    unsigned failingCall; /* the only call that returns `code`, counted from 1 */
    int numbered;         /* instead of the next three, the call's number, counted from 1 */
    char* netBIOSDomainName;
    char* dnsDomainName;
    char* domainSID;
    char* firstResult;
    char* secondResult;

    /* Recorded. One line a call: the entry's place in the record, then the arguments in order, a
     * null one as "(null)", each behind a blank and in single quotes. */
    unsigned calls;
    char log[CAM_RECORDING_LOG];
    int slotsWereNull; /* when the last call began */
} CAMRecording;

extern TSLAUTH_CAM_PROVIDER_EXPORT CAMRecording camRecording;

#ifdef __cplusplus
}
#endif

#endif
