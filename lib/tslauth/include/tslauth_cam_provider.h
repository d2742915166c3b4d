/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_CAM_PROVIDER_H
#define TSLAUTH_CAM_PROVIDER_H

/*
 * What a CAM provider implements: a shared library in C (or with C linkage), installed as
 * /usr/libexec/tslauth/lib<name>.so and named by the key "provider" of
 * /etc/tessel/tslauth/camprovider.conf. It speaks to a CAM server, an authentication proxy that
 * makes a host's machine account on the host's behalf, in whatever way that server wants. It
 * exports one data record, which stands at the end of this file; everything else about it is its
 * own.
 *
 * Loading. The library is opened with RTLD_LAZY and RTLD_GLOBAL, so that libraries which it loads
 * itself find its symbols: name what you export so that it meets nobody else's. It stays loaded
 * for one join or one question, and may be opened several times in a process. The record belongs to
 * the provider and is never copied, so that nothing it points to may move or be freed while it is
 * loaded.
 *
 * Threads. Each join runs on its caller's thread, without any lock of the library's: entries may be
 * called from several threads at once. A call may block; nobody puts a limit to it but the
 * provider.
 *
 * Memory. Arguments belong to the caller and are valid during the call alone. Results belong to the
 * provider and stay with it: nobody frees them, and there is no function to free them with. A
 * result must stay as it is until the same thread calls an entry again, or the library is unloaded;
 * the caller has copied it by then. None may be null where a call succeeds; where it fails, none is
 * looked at.
 *
 * Certificates. `verifyCertificate` is 1 where the server's certificate has to be verified, and 0
 * where it must not be. `thumbprint` is what the host's administrator has pinned for this server:
 * the SHA-1 digest of the certificate's DER form, as 20 pairs of upper-case hexadecimal digits with
 * ":" between them; empty where nothing was pinned, and never null. Whether a server may then be
 * trusted is the provider's decision; nobody checks it again.
 *
 * Failures. Every entry returns 0 for success, or one of the numbers below. Other numbers are
 * allowed: they reach the user as an unknown exception that carries the number. An entry must not
 * let a C++ exception escape.
 *
 * Text is bytes, ended by a zero byte; no encoding is assumed or converted.
 */

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Exported also where a provider is compiled with -fvisibility=hidden, as it should be. */
#define TSLAUTH_CAM_PROVIDER_EXPORT __attribute__((visibility("default")))

/* The codes that become an exception class of their own; the class is named beside each. The
 * numbering is that of the Windows system error codes (winerror.h, winsock2.h). */
enum {
    TSLAUTH_CAM_PROVIDER_SUCCESS = 0,
    TSLAUTH_CAM_PROVIDER_NOT_ENOUGH_MEMORY = 8,     /* NotEnoughMemoryException */
    TSLAUTH_CAM_PROVIDER_CONNECTION_REFUSED = 1225, /* ConnectionRefusedException */
    TSLAUTH_CAM_PROVIDER_CONNECTION_INVALID = 1229, /* ConnectionInvalidException */
    TSLAUTH_CAM_PROVIDER_TIMED_OUT = 10060,         /* WSATimedOutException */
    /* 0x80090325 as the `int` that an entry returns: InvalidCAMCertificateException */
    TSLAUTH_CAM_PROVIDER_INVALID_CERTIFICATE = -2146893019
};

/* What a CAM provider does. The record always has all of its members. Each function may be null:
 * the operation is then reported as not implemented (CallNotImplementedException).
 *
 * `server` is the server's IPv4 address as the caller wrote it, and never null. Result slots are
 * null when an entry is called. */
typedef struct CAMProxyClientOperationsRecord {
    /* The provider's own; not read by this library. 0 serves. */
    int32_t apiVersion;

    /* Stores the names and the security identifier of the domain that `server` serves. It is called
     * once for each of the three that is wanted, and stores all three. Returns a code. */
    int (*getDomainInformation)(char const* server, int verifyCertificate, char const* thumbprint,
                                char** netBIOSDomainName, char** dnsDomainName, char** domainSID);

    /* Makes `server` create a machine account `accountName`, which is this host's name without its
     * domain, and stores what the Active Directory provider needs to join with it: the members
     * `firstResult` and `secondResult` of its machine account record. Their meaning is agreed
     * between the two providers. `organisationalUnit` says where the account is to be made, null
     * where the caller leaves it to the server. Nothing calls for the account's removal where the
     * join then fails. Returns a code. */
    int (*createMachineAccount)(char const* server, char const* accountName,
                                char const* organisationalUnit, int verifyCertificate,
                                char const* thumbprint, char** firstResult, char** secondResult);
} CAMProxyClientOperationsRecord;

/* The symbol that a CAM provider defines. Include this header where it is defined: it gives it its
 * linkage and its visibility, and the compiler checks it. */
extern TSLAUTH_CAM_PROVIDER_EXPORT CAMProxyClientOperationsRecord const CAMProxyClientOperations;

/*
 * The layout, in bytes, as a provider compiled at another time and by another compiler sees it.
 * Each member is one pointer wide, but for the first word, which is followed by padding where
 * pointers have 64 bits.
 */
#ifdef __cplusplus
#define TSLAUTH_CAM_PROVIDER_ASSERT(name, condition) static_assert(condition, #name)
#else
#define TSLAUTH_CAM_PROVIDER_ASSERT(name, condition)                                               \
    typedef char tslauth_cam_provider_assert_##name[(condition) ? 1 : -1]
#endif
#define TSLAUTH_CAM_PROVIDER_BYTES(bits32, bits64) (sizeof(void*) == 4 ? (bits32) : (bits64))
#define TSLAUTH_CAM_PROVIDER_OFFSET(member, bits32, bits64)                                        \
    TSLAUTH_CAM_PROVIDER_ASSERT(member, offsetof(CAMProxyClientOperationsRecord, member) ==        \
                                            TSLAUTH_CAM_PROVIDER_BYTES(bits32, bits64))

TSLAUTH_CAM_PROVIDER_ASSERT(word, sizeof(void*) == 4 || sizeof(void*) == 8);
TSLAUTH_CAM_PROVIDER_ASSERT(function, sizeof(void (*)(void)) == sizeof(void*));
TSLAUTH_CAM_PROVIDER_ASSERT(int_is_32_bits, sizeof(int) == 4);
TSLAUTH_CAM_PROVIDER_OFFSET(apiVersion, 0, 0);
TSLAUTH_CAM_PROVIDER_OFFSET(getDomainInformation, 4, 8);
TSLAUTH_CAM_PROVIDER_OFFSET(createMachineAccount, 8, 16);
TSLAUTH_CAM_PROVIDER_ASSERT(size, sizeof(CAMProxyClientOperationsRecord) ==
                                      TSLAUTH_CAM_PROVIDER_BYTES(12, 24));

#undef TSLAUTH_CAM_PROVIDER_ASSERT
#undef TSLAUTH_CAM_PROVIDER_BYTES
#undef TSLAUTH_CAM_PROVIDER_OFFSET

#ifdef __cplusplus
}
#endif

#endif
