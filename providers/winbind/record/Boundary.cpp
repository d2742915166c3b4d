// SPDX-License-Identifier: Apache-2.0
#include "record/Boundary.h"

#include "Failure.h"

#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <syslog.h>

namespace tessel::winbind {

namespace {

struct Free {
    void operator()(void* memory) const {
        std::free(memory);
    }
};

template <typename T> using Allocated = std::unique_ptr<T, Free>;

template <typename T = char> Allocated<T> Allocate(std::size_t size) {
    Allocated<T> memory(static_cast<T*>(std::malloc(size)));
    if (memory == nullptr) {
        throw std::bad_alloc();
    }
    return memory;
}

Allocated<char> Copy(std::string const& text) {
    Allocated<char> copy = Allocate(text.size() + 1);
    std::memcpy(copy.get(), text.c_str(), text.size() + 1);
    return copy;
}

/// Puts `text` at `*end`, and `*end` behind it.
char* Append(std::string const& text, char** end) {
    char* const start = *end;
    std::memcpy(start, text.c_str(), text.size() + 1);
    *end += text.size() + 1;
    return start;
}

thread_local std::string lastFailure;

ActiveDirectoryClientErrorCode Report(char const* entry, ActiveDirectoryClientErrorCode code,
                                      char const* text) {
    syslog(LOG_WARNING, "winbind: %s: %s", entry, text);
    try {
        lastFailure = text;
    } catch (std::bad_alloc const&) {
        lastFailure.clear(); // the code is all there is to tell
    }
    if (code == TSLAUTH_PROVIDER_SUCCESS) {
        return TSLAUTH_PROVIDER_INTERNAL_ERROR; // the caller must not take it for a success
    }
    return code;
}

} // namespace

ActiveDirectoryClientErrorCode ReportFailure(char const* entry,
                                             std::exception_ptr const& failure) noexcept {
    try {
        std::rethrow_exception(failure);
    } catch (Failure const& e) {
        return Report(entry, e.Code(), e.what());
    } catch (std::bad_alloc const&) {
        return Report(entry, TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY, "out of memory");
    } catch (std::exception const& e) {
        return Report(entry, TSLAUTH_PROVIDER_INTERNAL_ERROR, e.what());
    } catch (...) {
        return Report(entry, TSLAUTH_PROVIDER_INTERNAL_ERROR, "an exception of no known class");
    }
}

char const* LastFailure() noexcept {
    return lastFailure.c_str();
}

void HandOut(std::string const& text, char** slot, ActiveDirectoryClientFreeFunction* release) {
    *slot = Copy(text).release();
    *release = &std::free;
}

void HandOut(authentication::Domain const& domain, ActiveDirectoryClientDomain* slot,
             ActiveDirectoryClientFreeFunction* release) {
    Allocated<char> dnsName = domain.DNSName().empty() ? nullptr : Copy(domain.DNSName());
    Allocated<char> netBIOSName =
        domain.NetBIOSName().empty() ? nullptr : Copy(domain.NetBIOSName());
    slot->dnsName = dnsName.release();
    slot->netBIOSName = netBIOSName.release();
    *release = &std::free;
}

void HandOut(std::vector<std::string> const& texts, char*** slot,
             ActiveDirectoryClientFreeFunction* release) {
    std::size_t const table = (texts.size() + 1) * sizeof(char*);
    std::size_t size = table;
    for (std::string const& text : texts) {
        size += text.size() + 1;
    }
    Allocated<char*> memory = Allocate<char*>(size);
    char** next = memory.get();
    char* end = reinterpret_cast<char*>(memory.get()) + table;
    for (std::string const& text : texts) {
        *next++ = Append(text, &end);
    }
    *next = nullptr;
    *slot = memory.release();
    *release = &std::free;
}

void HandOut(std::vector<authentication::Domain> const& domains,
             ActiveDirectoryClientDomain*** slot, ActiveDirectoryClientFreeFunction* release) {
    // The pointers, then the records, then their texts: in the order of their alignment.
    typedef ActiveDirectoryClientDomain Record;
    std::size_t const table = (domains.size() + 1) * sizeof(Record*);
    std::size_t const records = domains.size() * sizeof(Record);
    static_assert(alignof(Record) == alignof(Record*));
    std::size_t size = table + records;
    for (authentication::Domain const& domain : domains) {
        size += domain.DNSName().size() + 1 + domain.NetBIOSName().size() + 1;
    }
    Allocated<Record*> memory = Allocate<Record*>(size);
    Record** next = memory.get();
    char* const start = reinterpret_cast<char*>(memory.get());
    char* record = start + table;
    char* end = record + records;
    for (authentication::Domain const& domain : domains) {
        char const* const dnsName = Append(domain.DNSName(), &end);
        char const* const netBIOSName = Append(domain.NetBIOSName(), &end);
        *next++ = new (record) Record{dnsName, netBIOSName};
        record += sizeof(Record);
    }
    *next = nullptr;
    *slot = memory.release();
    *release = &std::free;
}

} // namespace tessel::winbind
