/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_WINBIND_PROVIDER_H
#define TSLAUTH_WINBIND_PROVIDER_H

/*
 * What the numbers of the provider `winbind` mean: libwinbind.so, which joins a host to an Active
 * Directory domain with Samba's winbind. The interface itself is tslauth_provider.h; this file
 * holds what that one leaves to a provider.
 *
 * Threads. Every entry may be called while any other runs, itself included. Joining, parting and
 * setting the preferred controllers wait for each other, in one process and among processes.
 *
 * Time. No entry takes longer than the bound of its kind below, whatever a domain controller, DNS
 * or winbindd do; what is not done by then fails with TSLAUTH_PROVIDER_TIMED_OUT.
 *
 *   from one small file, at once    get active domain, get preferred domain controllers
 *   a question                      trust state, trusted domains, machine account DN, any domain
 *                                   controller, canonical user name, host principal, relationship
 *   a join                          join domain, join domain with machine account
 *   a part                          part domain
 *   a change of one file            set preferred domain controllers; waits for a join or a part
 *                                   that runs, and then, for a question's time, for winbindd to be
 *                                   told
 *
 * A question that winbindd keeps waiting is left to a thread of its own. There are never more than
 * TSLAUTH_WINBIND_MAXIMUM_WAITING of these threads in a process: when all of them wait for winbindd
 * in vain, the next question fails with TSLAUTH_PROVIDER_TIMED_OUT at once. For their sake the
 * library stays in memory when it is closed.
 *
 * Failures are logged with syslog(3) at warning priority: "winbind: ", the entry, and what was
 * seen. No password is ever logged.
 *
 * The file is C99, and C++11 or later.
 */

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Bounds, in seconds. */
enum {
    TSLAUTH_WINBIND_QUESTION_SECONDS = 10,
    TSLAUTH_WINBIND_JOIN_SECONDS = 120,
    TSLAUTH_WINBIND_PART_SECONDS = 90
};

enum { TSLAUTH_WINBIND_MAXIMUM_WAITING = 8 };

/* What getDomainTrustState returns. It never fails: what could not be found out is a state as well.
 *
 *   number  in words        what was seen                             what to do
 *   0       in order        the controller has accepted the host's    -
 *                           secret, just now
 *   1       refused         a controller answered, and refused the    part, and join again
 *                           host: its account was deleted, disabled
 *                           or given another secret
 *   2       no controller   none answered within the bound; users     look at the network, DNS and
 *                           that have logged in before may still be   the controllers
 *                           known
 *   3       not running     winbindd does not run, so that no user    start it
 *                           of the domain is known
 *   4       not answering   winbindd runs, and does not answer        start it again
 *   5       unknown         anything else                             the system log says what
 *   6       clock           the clocks of the host and of the         set them
 *                           controller are too far apart
 *   7       not joined      the host is joined to no domain; the      join
 *                           library gives the same number
 */
enum {
    TSLAUTH_WINBIND_TRUST_HEALTHY = 0,
    TSLAUTH_WINBIND_TRUST_SECRET_REFUSED = 1,
    TSLAUTH_WINBIND_TRUST_NO_CONTROLLER = 2,
    TSLAUTH_WINBIND_TRUST_NOT_RUNNING = 3,
    TSLAUTH_WINBIND_TRUST_NOT_ANSWERING = 4,
    TSLAUTH_WINBIND_TRUST_UNKNOWN = 5,
    TSLAUTH_WINBIND_TRUST_CLOCK = 6,
    TSLAUTH_WINBIND_TRUST_NOT_JOINED = 7
};

/* The bits of what getDomainTrustRelationship returns, as seen from the host's own domain. 0: there
 * is no trust, or it could not be found out; the system log then says why. The host's own domain
 * has all four bits. */
enum {
    TSLAUTH_WINBIND_TRUST_IN_FOREST = 0x1,  /* a domain of the same forest */
    TSLAUTH_WINBIND_TRUST_TRANSITIVE = 0x2, /* it covers what that domain trusts */
    TSLAUTH_WINBIND_TRUST_INBOUND = 0x4,    /* that domain trusts the host's domain */
    TSLAUTH_WINBIND_TRUST_OUTBOUND = 0x8 /* the host's domain trusts that one: its users log in */
};

/* Codes outside the numbering of tslauth_provider.h. They reach the user as an unknown exception
 * that carries the number. */

/* Samba's tools failed in a way that has no number; their own text is in the system log. */
#define TSLAUTH_WINBIND_SEE_SYSTEM_LOG UINT32_C(0xFFFF0000)

/* A join was accepted by the controller, could not be finished on the host, and could not be undone
 * in the directory: it may keep the host's account, as the system log says. The host is as it
 * was. */
#define TSLAUTH_WINBIND_ACCOUNT_LEFT UINT32_C(0xFFFF0001)

/* A join, a part or a change failed, and the host is not as it was: what could not be taken back,
 * or was not finished, is named in the system log. The directory may not be as it was either. */
#define TSLAUTH_WINBIND_HOST_CHANGED UINT32_C(0xFFFF0002)

/* Not enough room on the host's disks; in the numbering of tslauth_provider.h, which has no class
 * for it. Nothing was changed. */
#define TSLAUTH_WINBIND_DISK_FULL UINT32_C(112)

#ifdef __cplusplus
}
#endif

#endif
