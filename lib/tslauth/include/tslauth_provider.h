/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TSLAUTH_PROVIDER_H
#define TSLAUTH_PROVIDER_H

/*
 * What an Active Directory provider implements: a shared library in C (or with C linkage),
 * installed as /usr/libexec/tslauth/lib<name>.so and named by the key "provider" of
 * /etc/tessel/tslauth/provider.conf. It exports two data records, which stand at the end of this
 * file, and a function if it likes; everything else about it is its own.
 *
 * Loading. The library is opened with RTLD_LAZY and stays loaded as long as an adapter lives; it
 * may be opened several times in a process. Both records belong to the provider and are never
 * copied, so that nothing they point to may move or be freed while it is loaded.
 *
 * Threads. Entries are called from several threads at once, without any lock of the library's.
 * Each of them must be safe to call at the same time as every other, itself included. A call may
 * block; some of them are made on threads that nobody waits for any longer. The child of a process
 * that forked during a call makes calls of its own: a lock that the provider held stays held there,
 * unless it sees to that with pthread_atfork(3). A thread may be cancelled in a call; what the call
 * has opened and allocated may be lost then, and the other threads go on. Who holds a lock, or is
 * written in C++, keeps the cancellation off meanwhile with pthread_setcancelstate(3).
 *
 * Memory. Arguments belong to the caller and are valid during the call alone. Results belong to
 * the provider until it gives them up by storing, next to them, a pointer to the function that
 * releases them; the caller copies and then calls that function, once for each pointer that the
 * entry's comment names. Where a call fails, nothing is released, and nothing may be handed out.
 *
 * Failures. An entry that returns a code returns 0 for success, or one of the numbers below. Other
 * numbers are allowed: they reach the user as an unknown exception that carries the number. An
 * entry must not let a C++ exception escape.
 *
 * Text is bytes, ended by a zero byte; no encoding is assumed or converted.
 *
 * The file is C99, and C++11 or later.
 */

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* The newest version of this interface. A provider that states a greater one is refused; every
 * smaller one is accepted. Version 2 added two entries to the operations record. */
#define TSLAUTH_PROVIDER_API_VERSION 2

/* Exported also where a provider is compiled with -fvisibility=hidden, as it should be. */
#define TSLAUTH_PROVIDER_EXPORT __attribute__((visibility("default")))

/* A failure, in the numbering of the Windows system error codes (winerror.h, lmerr.h,
 * winsock2.h). An `int` that an entry returns is read as this unsigned number. */
typedef uint32_t ActiveDirectoryClientErrorCode;

/* The codes that become an exception class of their own; the class is named beside each. */
enum {
    TSLAUTH_PROVIDER_SUCCESS = 0,
    TSLAUTH_PROVIDER_FILE_NOT_FOUND = 2,                   /* FileNotFoundException */
    TSLAUTH_PROVIDER_ACCESS_DENIED = 5,                    /* AccessDeniedException */
    TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY = 8,                /* NotEnoughMemoryException */
    TSLAUTH_PROVIDER_INVALID_PASSWORD = 86,                /* InvalidPasswordException */
    TSLAUTH_PROVIDER_INVALID_PARAMETER = 87,               /* InvalidParameterException */
    TSLAUTH_PROVIDER_CALL_NOT_IMPLEMENTED = 120,           /* CallNotImplementedException */
    TSLAUTH_PROVIDER_DIRECTORY = 267,                      /* DirectoryException */
    TSLAUTH_PROVIDER_BAD_DLL_ENTRY_POINT = 609,            /* BadDLLEntryPointException */
    TSLAUTH_PROVIDER_INVALID_MESSAGE = 1002,               /* InvalidMessageException */
    TSLAUTH_PROVIDER_SERVICE_DOES_NOT_EXIST = 1060,        /* ServiceDoesNotExistException */
    TSLAUTH_PROVIDER_SERVICE_CANNOT_ACCEPT_CONTROL = 1061, /* ServiceCannotAcceptControlException */
    TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE = 1062,            /* ServiceNotActiveException */
    TSLAUTH_PROVIDER_EXCEPTION_IN_SERVICE = 1064,          /* ExceptionInServiceException */
    TSLAUTH_PROVIDER_PROCESS_ABORTED = 1067,               /* ProcessAbortedException */
    TSLAUTH_PROVIDER_CONNECTION_UNAVAILABLE = 1201,        /* ConnectionUnavailableException */
    TSLAUTH_PROVIDER_INVALID_GROUP_NAME = 1209,            /* InvalidGroupNameException */
    TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME = 1210,         /* InvalidComputerNameException */
    TSLAUTH_PROVIDER_INVALID_DOMAIN_NAME = 1212,           /* InvalidDomainNameException */
    TSLAUTH_PROVIDER_INVALID_SERVICE_NAME = 1213,          /* InvalidServiceNameException */
    TSLAUTH_PROVIDER_INVALID_NET_NAME = 1214,              /* InvalidNetNameException */
    TSLAUTH_PROVIDER_INVALID_SHARE_NAME = 1215,            /* InvalidShareNameException */
    TSLAUTH_PROVIDER_INVALID_PASSWORD_NAME = 1216,         /* InvalidPasswordNameException */
    TSLAUTH_PROVIDER_NO_NETWORK = 1222,                    /* NoNetworkException */
    TSLAUTH_PROVIDER_CONNECTION_REFUSED = 1225,            /* ConnectionRefusedException */
    TSLAUTH_PROVIDER_CONNECTION_INVALID = 1229,            /* ConnectionInvalidException */
    TSLAUTH_PROVIDER_NO_LOGON_SERVERS = 1311,              /* NoLogonServersException */
    TSLAUTH_PROVIDER_INVALID_ACCOUNT_NAME = 1315,          /* InvalidAccountNameException */
    TSLAUTH_PROVIDER_NO_SUCH_USER = 1317,                  /* NoSuchUserException */
    TSLAUTH_PROVIDER_ILL_FORMED_PASSWORD = 1324,           /* IllFormedPasswordException */
    TSLAUTH_PROVIDER_PASSWORD_RESTRICTION = 1325,          /* PasswordRestrictionException */
    TSLAUTH_PROVIDER_LOGON_FAILURE = 1326,                 /* LogonFailureException */
    TSLAUTH_PROVIDER_PASSWORD_EXPIRED = 1330,              /* PasswordExpiredException */
    TSLAUTH_PROVIDER_ACCOUNT_DISABLED = 1331,              /* AccountDisabledException */
    TSLAUTH_PROVIDER_NO_SUCH_DOMAIN = 1355,                /* NoSuchDomainException */
    TSLAUTH_PROVIDER_INTERNAL_ERROR = 1359,                /* InternalErrorException */
    TSLAUTH_PROVIDER_TIME_SKEW = 1398,                     /* TimeSkewException */
    TSLAUTH_PROVIDER_NO_SUCH_GROUP = 1575,                 /* NoSuchGroupException */
    TSLAUTH_PROVIDER_RPC_PROTOCOL_SEQUENCE_NOT_SUPPORTED =
        1703,                                     /* RPCSProtocolSequenceNotSupportedException */
    TSLAUTH_PROVIDER_NO_TRUST_LSA_SECRET = 1786,  /* NoTrustLSASecretException */
    TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT = 1787, /* NoTrustSAMAccountException */
    TSLAUTH_PROVIDER_RPC_CALL_IN_PROGRESS = 1791, /* RPCSCallInProgressException */
    TSLAUTH_PROVIDER_DOMAIN_TRUST_INCONSISTENT = 1810, /* DomainTrustInconsistentException */
    TSLAUTH_PROVIDER_WKSTA_NOT_STARTED = 2138,         /* WkstaNotStartedException */
    TSLAUTH_PROVIDER_SETUP_ALREADY_JOINED = 2691,      /* SetupAlreadyJoinedException */
    TSLAUTH_PROVIDER_INVALID_WORKGROUP_NAME = 2695,    /* InvalidWorkgroupNameException */
    TSLAUTH_PROVIDER_TIMED_OUT = 10060                 /* WSATimedOutException */
};

/* The state of a host's trust in its domain, as getDomainTrustState returns it. Tools show each by
 * these words; a provider may return other numbers of its own, which are shown as such. */
enum {
    TSLAUTH_PROVIDER_TRUST_IN_ORDER = 0,
    TSLAUTH_PROVIDER_TRUST_SECRET_REFUSED = 1,
    TSLAUTH_PROVIDER_TRUST_NO_CONTROLLER = 2,
    TSLAUTH_PROVIDER_TRUST_SERVICE_NOT_RUNNING = 3,
    TSLAUTH_PROVIDER_TRUST_SERVICE_NOT_ANSWERING = 4,
    TSLAUTH_PROVIDER_TRUST_UNKNOWN = 5,
    TSLAUTH_PROVIDER_TRUST_CLOCKS_APART = 6,
    TSLAUTH_PROVIDER_TRUST_NOT_JOINED = 7
};

/* Releases what a provider handed out. A provider that hands out memory of its own, static or
 * shared, may leave the pointer to this function null: then nothing is called. */
typedef void (*ActiveDirectoryClientFreeFunction)(void* memory);

/* Who asks. Both texts belong to the caller; either may be null, and either may be empty. Whether
 * the user name carries a domain is between the user and the provider. */
typedef struct ActiveDirectoryClientCredentials {
    char const* userName;
    char const* password;
} ActiveDirectoryClientCredentials;

/* The two names of a domain. */
typedef struct ActiveDirectoryClientDomain {
    char const* dnsName;
    char const* netBIOSName;
} ActiveDirectoryClientDomain;

/* What a CAM server says about its domain. All texts belong to the caller; none is null, unknown
 * ones are empty. */
typedef struct ActiveDirectoryClientDomainInformation {
    char const* unused; /* always empty today */
    char const* netBIOSDomainName;
    char const* dnsDomainName;
    char const* domainSID;
} ActiveDirectoryClientDomainInformation;

/* The machine account that a CAM server made for this host. All texts belong to the caller; none is
 * null, unknown ones are empty. What the two results mean is agreed between the CAM provider that
 * produced them and the provider that receives them. */
typedef struct ActiveDirectoryClientMachineAccount {
    char const* accountName; /* the host's name without its domain */
    char const* dnsDomainName;
    char const* unused; /* always empty today */
    char const* firstResult;
    char const* secondResult;
} ActiveDirectoryClientMachineAccount;

/* What a provider is: which modules the host's log-in configuration must name. Read once, when the
 * provider is loaded. All members exist from version 0. Nothing here is ever freed. */
typedef struct ActiveDirectoryClientMetadataRecord {
    /* The version of this interface that the provider was written for. Greater than
     * TSLAUTH_PROVIDER_API_VERSION: refused. */
    int32_t apiVersion;

    /* File name of the PAM module, such as "pam_example.so". Never null. The library writes it as
     * "sufficient /lib/security/$ISA/" + this + parameters, into "auth" and "account" alone; libpam
     * passes over a module that it cannot load. */
    char const* pamModule;

    /* Its parameters, separated by white space; there is no quoting. May be null: none. */
    char const* pamModuleParameters;

    /* Name of the name service, as nsswitch.conf(5) takes it. Never null. */
    char const* nssModule;

    /* Its parameters, separated by white space; there is no quoting. May be null: none. Leave it
     * null: they are written as "[" + parameters + "]" behind the name, which to the C library are
     * actions of that service, and the library's reader passes over the services behind a bracket.
     * So an activation that is repeated or taken back drops "files" from "passwd", and with it
     * every local user; tslauthctl refuses such a provider. */
    char const* nssModuleParameters;
} ActiveDirectoryClientMetadataRecord;

/* What a provider does. The record always has all of its members, whatever version it states. Each
 * function may be null: the operation is then reported as not implemented
 * (CallNotImplementedException).
 *
 * Result slots are null when an entry is called, and a slot that it leaves null is an empty result.
 * `release` is where a provider stores the function that releases what it handed out. */
typedef struct ActiveDirectoryClientOperationsRecord {
    /* The version of this record, which may differ from the metadata's. The two entries of version
     * 2 are called only where it is 2 or more. */
    int32_t apiVersion;

    /* Joins the host to `domain`. `organisationalUnit` says where the machine account is to be
     * made, null where the caller leaves it to the provider; `credentials` is never null. From
     * version 0. Returns a code. */
    int (*joinDomain)(char const* domain, char const* organisationalUnit,
                      ActiveDirectoryClientCredentials const* credentials);

    /* Parts the host from its domain. `credentials` is null where the caller gave none. From
     * version 0. Returns a code. */
    int (*partDomain)(ActiveDirectoryClientCredentials const* credentials);

    /* Fills `domain` with the names of the domain that the host is joined to; either may stay null.
     * `release` is called once for each of the two names that is not null, so they are allocated
     * one by one. `domain` itself is the caller's. From version 0. Returns a code. */
    int (*getActiveDomain)(ActiveDirectoryClientDomain* domain,
                           ActiveDirectoryClientFreeFunction* release);

    /* Sets the domain controllers to ask first, in order. The array ends with a null and is never
     * null itself; it and its texts are the caller's. From version 0. Returns a code. */
    int (*setPreferredDomainControllers)(char const** controllers);

    /* Stores an array of names, ended by a null, in `controllers`. `release` is called once, with
     * the array (also where it is null), and releases the names with it. From version 0. Returns a
     * code. */
    int (*getPreferredDomainControllers)(char*** controllers,
                                         ActiveDirectoryClientFreeFunction* release);

    /* Never called. Leave it null. */
    void (*unused)(void);

    /* Returns the state of the host's trust in its domain: the value itself, which is handed to the
     * user unchanged. Give 0 the meaning "nothing to report": it is also the answer for a provider
     * without this entry, as 7 is where getTrustedDomains failed with FILE_NOT_FOUND. From
     * version 0. */
    int (*getDomainTrustState)(void);

    /* Stores an array of pointers to records, ended by a null, in `domains`. Neither member of a
     * record may be null. `release` is called once, with the array (also where it is null), and
     * releases the records and their names with it. From version 0. Returns a code. */
    int (*getTrustedDomains)(ActiveDirectoryClientDomain*** domains,
                             ActiveDirectoryClientFreeFunction* release);

    /* Stores the distinguished name of the host's machine account. `release` is called once with
     * it, unless it is null. From version 0. Returns a code. */
    int (*getMachineAccountDN)(char** name, ActiveDirectoryClientFreeFunction* release);

    /* Stores the name of a domain controller of `domain`, which is never null. `first` narrows the
     * choice in a way that is the provider's own; it is null where the caller leaves it open.
     * `release` is called once with the result, unless it is null. From version 0. Returns a
     * code. */
    int (*getAnyDomainController)(char const* first, char const* domain, char** controller,
                                  ActiveDirectoryClientFreeFunction* release);

    /* Stores the form of `name`, which is never null, under which the host knows that user.
     * `release` is called once with the result, unless it is null. From version 0. Returns a
     * code. */
    int (*convertCanonicalUsername)(char const* name, char** canonicalName,
                                    ActiveDirectoryClientFreeFunction* release);

    /* Joins the host with a machine account that exists already. Neither argument is null. From
     * version 2: in an older record the entry is ignored. Returns a code. */
    int (*joinDomainWithMachineAccount)(
        ActiveDirectoryClientDomainInformation const* domainInformation,
        ActiveDirectoryClientMachineAccount const* account);

    /* Stores the host's principal in `domain`, which is never null. `release` is called once with
     * the result, unless it is null. From version 2: in an older record the entry is ignored.
     * Returns a code. */
    int (*getHostPrincipalForDomain)(char const* domain, char** principal,
                                     ActiveDirectoryClientFreeFunction* release);

    /* Returns the relationship between the host's domain and `domain`, which is never null: the
     * value itself, which is handed to the user unchanged. Give 0 the meaning "none": it is also
     * the answer for a provider without this entry. From version 0. */
    int (*getDomainTrustRelationship)(char const* domain);
} ActiveDirectoryClientOperationsRecord;

/* A third symbol, which a provider may define: why the last entry that failed on the calling thread
 * did so, in words for an administrator; what a code cannot say, such as the name of a unit that
 * does not exist. Never a secret. The text belongs to the provider, and is valid until the thread's
 * next call to it; null or empty where there is nothing to tell. Asked for by its name alone, so
 * that it belongs to no version, and a provider without it is as good as before. */
extern TSLAUTH_PROVIDER_EXPORT char const* ActiveDirectoryClientLastFailure(void);

/* A fourth symbol, which a provider may define: looks at what a join would meet, and changes
 * nothing on the host nor in the directory. The arguments are those of `joinDomain`, but the
 * credentials may be null; then nothing is told that takes an account. Stores one line each,
 * "what: finding", with a line feed behind each: what was looked at ("controller", "clock",
 * "computer", "unit", "account", or others), and what was found, in words for an administrator.
 * What would stop the join is a finding as well. `release` is called once with the text, unless it
 * is null. Returns a code, where nothing can be told. Asked for by its name alone, as the third
 * one. */
extern TSLAUTH_PROVIDER_EXPORT int
ActiveDirectoryClientPreviewJoin(char const* domain, char const* organisationalUnit,
                                 ActiveDirectoryClientCredentials const* credentials, char** text,
                                 ActiveDirectoryClientFreeFunction* release);

/* The two symbols that a provider must define. Include this header where they are defined: it gives
 * them their linkage and their visibility, and the compiler checks them. */
extern TSLAUTH_PROVIDER_EXPORT ActiveDirectoryClientMetadataRecord const
    ActiveDirectoryClientMetadata;
extern TSLAUTH_PROVIDER_EXPORT ActiveDirectoryClientOperationsRecord const
    ActiveDirectoryClientOperations;

/*
 * The layout, in bytes, as a provider compiled at another time and by another compiler sees it: of
 * a member by its place in the record, and of a record by the number of its members. Each member
 * is one pointer wide, but for the version word, which is followed by padding where pointers have
 * 64 bits.
 */
#ifdef __cplusplus
#define TSLAUTH_PROVIDER_ASSERT(name, condition) static_assert(condition, #name)
#else
#define TSLAUTH_PROVIDER_ASSERT(name, condition)                                                   \
    typedef char tslauth_provider_assert_##name[(condition) ? 1 : -1]
#endif
#define TSLAUTH_PROVIDER_BYTES(bits32, bits64) (sizeof(void*) == 4 ? (bits32) : (bits64))
#define TSLAUTH_PROVIDER_OFFSET(record, member, bits32, bits64)                                    \
    TSLAUTH_PROVIDER_ASSERT(record##_##member, offsetof(ActiveDirectoryClient##record, member) ==  \
                                                   TSLAUTH_PROVIDER_BYTES(bits32, bits64))
#define TSLAUTH_PROVIDER_SIZE(record, bits32, bits64)                                              \
    TSLAUTH_PROVIDER_ASSERT(record##_size, sizeof(ActiveDirectoryClient##record) ==                \
                                               TSLAUTH_PROVIDER_BYTES(bits32, bits64))

TSLAUTH_PROVIDER_ASSERT(word, sizeof(void*) == 4 || sizeof(void*) == 8);
TSLAUTH_PROVIDER_ASSERT(function, sizeof(void (*)(void)) == sizeof(void*));
TSLAUTH_PROVIDER_ASSERT(int_is_32_bits, sizeof(int) == 4);

TSLAUTH_PROVIDER_OFFSET(Credentials, userName, 0, 0);
TSLAUTH_PROVIDER_OFFSET(Credentials, password, 4, 8);
TSLAUTH_PROVIDER_SIZE(Credentials, 8, 16);

TSLAUTH_PROVIDER_OFFSET(Domain, dnsName, 0, 0);
TSLAUTH_PROVIDER_OFFSET(Domain, netBIOSName, 4, 8);
TSLAUTH_PROVIDER_SIZE(Domain, 8, 16);

TSLAUTH_PROVIDER_OFFSET(DomainInformation, unused, 0, 0);
TSLAUTH_PROVIDER_OFFSET(DomainInformation, netBIOSDomainName, 4, 8);
TSLAUTH_PROVIDER_OFFSET(DomainInformation, dnsDomainName, 8, 16);
TSLAUTH_PROVIDER_OFFSET(DomainInformation, domainSID, 12, 24);
TSLAUTH_PROVIDER_SIZE(DomainInformation, 16, 32);

TSLAUTH_PROVIDER_OFFSET(MachineAccount, accountName, 0, 0);
TSLAUTH_PROVIDER_OFFSET(MachineAccount, dnsDomainName, 4, 8);
TSLAUTH_PROVIDER_OFFSET(MachineAccount, unused, 8, 16);
TSLAUTH_PROVIDER_OFFSET(MachineAccount, firstResult, 12, 24);
TSLAUTH_PROVIDER_OFFSET(MachineAccount, secondResult, 16, 32);
TSLAUTH_PROVIDER_SIZE(MachineAccount, 20, 40);

TSLAUTH_PROVIDER_OFFSET(MetadataRecord, apiVersion, 0, 0);
TSLAUTH_PROVIDER_OFFSET(MetadataRecord, pamModule, 4, 8);
TSLAUTH_PROVIDER_OFFSET(MetadataRecord, pamModuleParameters, 8, 16);
TSLAUTH_PROVIDER_OFFSET(MetadataRecord, nssModule, 12, 24);
TSLAUTH_PROVIDER_OFFSET(MetadataRecord, nssModuleParameters, 16, 32);
TSLAUTH_PROVIDER_SIZE(MetadataRecord, 20, 40);

TSLAUTH_PROVIDER_OFFSET(OperationsRecord, apiVersion, 0, 0);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, joinDomain, 4, 8);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, partDomain, 8, 16);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getActiveDomain, 12, 24);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, setPreferredDomainControllers, 16, 32);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getPreferredDomainControllers, 20, 40);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, unused, 24, 48);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getDomainTrustState, 28, 56);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getTrustedDomains, 32, 64);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getMachineAccountDN, 36, 72);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getAnyDomainController, 40, 80);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, convertCanonicalUsername, 44, 88);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, joinDomainWithMachineAccount, 48, 96);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getHostPrincipalForDomain, 52, 104);
TSLAUTH_PROVIDER_OFFSET(OperationsRecord, getDomainTrustRelationship, 56, 112);
TSLAUTH_PROVIDER_SIZE(OperationsRecord, 60, 120);

#undef TSLAUTH_PROVIDER_ASSERT
#undef TSLAUTH_PROVIDER_BYTES
#undef TSLAUTH_PROVIDER_OFFSET
#undef TSLAUTH_PROVIDER_SIZE

#ifdef __cplusplus
}
#endif

#endif
