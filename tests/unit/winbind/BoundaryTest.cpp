// SPDX-License-Identifier: Apache-2.0
#include "record/Boundary.h"
#include "Failure.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <new>
#include <stdexcept>

using namespace tessel::winbind;
using tessel::authentication::Domain;

namespace {

std::string const longText = "a text that is longer than a short string can hold";

template <typename Exception> int CodeOfThrowing(Exception const& exception) {
    return CodeOf("a test", [&] { throw exception; });
}

} // namespace

TEST(BoundaryTest, AnEntryThatReturnsIsASuccess) {
    EXPECT_EQ(0, CodeOf("a test", [] {}));
    EXPECT_EQ(42, ValueOf("a test", 5, [] { return 42; }));
}

TEST(BoundaryTest, AFailureIsItsCode) {
    EXPECT_EQ(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN,
              CodeOfThrowing(Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, "none")));
    EXPECT_EQ(TSLAUTH_WINBIND_ACCOUNT_LEFT,
              static_cast<ActiveDirectoryClientErrorCode>(
                  CodeOfThrowing(Failure(TSLAUTH_WINBIND_ACCOUNT_LEFT, ""))));
}

TEST(BoundaryTest, AFailureWithoutACodeIsNoSuccess) {
    EXPECT_EQ(TSLAUTH_PROVIDER_INTERNAL_ERROR, CodeOfThrowing(Failure(0, "none")));
}

TEST(BoundaryTest, ALackOfMemoryHasItsCode) {
    EXPECT_EQ(TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY, CodeOfThrowing(std::bad_alloc()));
}

TEST(BoundaryTest, NoExceptionEscapes) {
    EXPECT_EQ(TSLAUTH_PROVIDER_INTERNAL_ERROR, CodeOfThrowing(std::runtime_error("%s%n")));
    EXPECT_EQ(TSLAUTH_PROVIDER_INTERNAL_ERROR, CodeOfThrowing(42));
    EXPECT_EQ(5, ValueOf("a test", 5, []() -> int { throw 42; }));
}

TEST(BoundaryTest, AThreadThatIsCancelledInAnEntryComesToItsEnd) {
    bool ended = false;
    pthread_t thread;
    auto const call = [](void* argument) -> void* {
        (void)CodeOf("a test", [argument] {
            (void)pthread_cancel(pthread_self());
            pthread_testcancel();
            *static_cast<bool*>(argument) = true;
        });
        pthread_testcancel(); // here it is allowed
        *static_cast<bool*>(argument) = false;
        return nullptr;
    };
    ASSERT_EQ(0, pthread_create(&thread, nullptr, call, &ended));
    void* result = nullptr;
    ASSERT_EQ(0, pthread_join(thread, &result));
    EXPECT_TRUE(ended);
    EXPECT_EQ(PTHREAD_CANCELED, result);
}

TEST(BoundaryTest, ATextIsReleasedByItself) {
    char* text = nullptr;
    ActiveDirectoryClientFreeFunction release = nullptr;
    HandOut(longText, &text, &release);
    EXPECT_EQ(longText, text);
    release(text);
}

TEST(BoundaryTest, TheNamesOfADomainAreReleasedOneByOne) {
    ActiveDirectoryClientDomain domain = {nullptr, nullptr};
    ActiveDirectoryClientFreeFunction release = nullptr;
    HandOut(Domain(longText, "CORP"), &domain, &release);
    EXPECT_EQ(longText, domain.dnsName);
    EXPECT_STREQ("CORP", domain.netBIOSName);
    release(const_cast<char*>(domain.netBIOSName));
    EXPECT_EQ(longText, domain.dnsName);
    release(const_cast<char*>(domain.dnsName));
}

TEST(BoundaryTest, AnEmptyNameStaysNull) {
    ActiveDirectoryClientDomain domain = {nullptr, nullptr};
    ActiveDirectoryClientFreeFunction release = nullptr;
    HandOut(Domain(), &domain, &release);
    EXPECT_EQ(nullptr, domain.dnsName);
    EXPECT_EQ(nullptr, domain.netBIOSName);
    HandOut(Domain("corp.example", ""), &domain, &release);
    EXPECT_STREQ("corp.example", domain.dnsName);
    EXPECT_EQ(nullptr, domain.netBIOSName);
    release(const_cast<char*>(domain.dnsName));
}

TEST(BoundaryTest, TextsAreReleasedWithTheirArray) {
    for (std::vector<std::string> const& texts :
         {std::vector<std::string>(), std::vector<std::string>{""},
          std::vector<std::string>{"dc1.corp.example", "", longText}}) {
        char** array = nullptr;
        ActiveDirectoryClientFreeFunction release = nullptr;
        HandOut(texts, &array, &release);
        std::vector<std::string> found;
        for (char** next = array; *next != nullptr; ++next) {
            found.emplace_back(*next);
        }
        EXPECT_EQ(texts, found);
        release(array);
    }
}

TEST(BoundaryTest, RecordsAndTheirNamesAreReleasedWithTheirArray) {
    for (std::vector<Domain> const& domains :
         {std::vector<Domain>(), std::vector<Domain>{Domain("", "OTHER")},
          std::vector<Domain>{Domain("corp.example", "CORP"), Domain(longText, "O"), Domain()}}) {
        ActiveDirectoryClientDomain** array = nullptr;
        ActiveDirectoryClientFreeFunction release = nullptr;
        HandOut(domains, &array, &release);
        std::vector<Domain> found;
        for (ActiveDirectoryClientDomain** next = array; *next != nullptr; ++next) {
            ASSERT_NE(nullptr, (*next)->dnsName); // neither may be null
            ASSERT_NE(nullptr, (*next)->netBIOSName);
            found.emplace_back((*next)->dnsName, (*next)->netBIOSName);
        }
        EXPECT_EQ(domains, found);
        release(array);
    }
}
