// SPDX-License-Identifier: Apache-2.0
// The name service as the C library loads it. Of the machine's own files these tests know that they
// hold the user and the group root, with the number 0.
#include "FakeWinbindd.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <dlfcn.h>
#include <grp.h>
#include <memory>
#include <nss.h>
#include <pwd.h>

using testing::ElementsAre;

bool nss_wrapper_enabled() {
    return true;
}
bool uid_wrapper_enabled() {
    return true;
}

namespace {

/// One of the module's functions.
template <typename Function> Function Find(char const* name) {
    static void* const module = ::dlopen(NAME_SERVICE, RTLD_NOW | RTLD_LOCAL);
    void* const found = module == nullptr ? nullptr : ::dlsym(module, name);
    if (found == nullptr) {
        throw std::runtime_error(::dlerror());
    }
    return reinterpret_cast<Function>(found);
}

#define FIND(name) Find<decltype(&name)>(#name)

extern "C" {
nss_status _nss_tslauth_winbind_getpwnam_r(char const*, passwd*, char*, std::size_t, int*);
nss_status _nss_tslauth_winbind_getpwuid_r(uid_t, passwd*, char*, std::size_t, int*);
nss_status _nss_tslauth_winbind_getgrnam_r(char const*, group*, char*, std::size_t, int*);
nss_status _nss_tslauth_winbind_getgrgid_r(gid_t, group*, char*, std::size_t, int*);
nss_status _nss_tslauth_winbind_initgroups_dyn(char const*, gid_t, long*, long*, gid_t**, long,
                                               int*);
}

/// Two texts of 256 bytes and two numbers, then three more texts: a user in winbindd's answer.
std::string User(std::string const& name, std::uint32_t user, std::uint32_t group) {
    std::string answer = FakeWinbindd::Answer(FakeWinbindd::Ok);
    std::size_t at = 2 * sizeof user;
    auto const text = [&](std::string const& value) {
        answer.replace(at, value.size(), value);
        at += 256;
    };
    auto const number = [&](std::uint32_t value) {
        std::memcpy(&answer[at], &value, sizeof value);
        at += sizeof value;
    };
    text(name);
    text("*");
    number(user);
    number(group);
    text("A User");
    text("/home/" + name);
    text("/bin/sh");
    return answer;
}

/// Likewise a group: two texts, its number, how many members and where they begin.
std::string Group(std::string const& name, std::uint32_t group, std::uint32_t count,
                  std::string const& members) {
    std::string answer = FakeWinbindd::Answer(FakeWinbindd::Ok, 0, members + '\0');
    answer.replace(2 * sizeof group, name.size(), name);
    std::uint32_t const numbers[] = {group, count, 0};
    std::memcpy(&answer[2 * sizeof group + 2 * std::size_t{256}], numbers, sizeof numbers);
    return answer;
}

std::string Groups(std::vector<gid_t> const& numbers) {
    std::string extra(numbers.size() * sizeof(gid_t), '\0');
    std::memcpy(&extra[0], numbers.data(), extra.size());
    return FakeWinbindd::Answer(FakeWinbindd::Ok, static_cast<std::uint32_t>(numbers.size()),
                                extra);
}

struct FoundUser {
    nss_status status;
    passwd entry = {};
    std::vector<char> buffer = std::vector<char>(1024);
    int error = 0;
};

std::unique_ptr<FoundUser> FindUser(char const* name, std::size_t size = 1024) {
    auto found = std::make_unique<FoundUser>();
    found->status = FIND(_nss_tslauth_winbind_getpwnam_r)(name, &found->entry, found->buffer.data(),
                                                          size, &found->error);
    return found;
}

std::unique_ptr<FoundUser> FindUser(uid_t number) {
    auto found = std::make_unique<FoundUser>();
    found->status = FIND(_nss_tslauth_winbind_getpwuid_r)(
        number, &found->entry, found->buffer.data(), found->buffer.size(), &found->error);
    return found;
}

struct FoundGroup {
    nss_status status;
    group entry = {};
    std::vector<char> buffer = std::vector<char>(1024);
    int error = 0;

    std::vector<std::string> Members() const {
        std::vector<std::string> members;
        for (char const* const* member = entry.gr_mem; *member != nullptr; ++member) {
            members.emplace_back(*member);
        }
        return members;
    }
};

std::unique_ptr<FoundGroup> FindGroup(char const* name, std::size_t begin = 0,
                                      std::size_t size = 1024) {
    auto found = std::make_unique<FoundGroup>();
    found->status = FIND(_nss_tslauth_winbind_getgrnam_r)(
        name, &found->entry, found->buffer.data() + begin, size - begin, &found->error);
    return found;
}

std::unique_ptr<FoundGroup> FindGroup(gid_t number) {
    auto found = std::make_unique<FoundGroup>();
    found->status = FIND(_nss_tslauth_winbind_getgrgid_r)(
        number, &found->entry, found->buffer.data(), found->buffer.size(), &found->error);
    return found;
}

/// As glibc calls it: the primary group stands first.
struct FoundGroups {
    explicit FoundGroups(char const* user, gid_t primary, long limit = 0) {
        numbers[0] = primary;
        status = FIND(_nss_tslauth_winbind_initgroups_dyn)(user, primary, &count, &size, &numbers,
                                                           limit, &error);
    }
    FoundGroups(FoundGroups const&) = delete;
    FoundGroups& operator=(FoundGroups const&) = delete;
    ~FoundGroups() {
        std::free(numbers);
    }

    std::vector<gid_t> Numbers() const {
        return {numbers, numbers + count};
    }

    nss_status status;
    int error = 0;
    long count = 1;
    long size = 1;
    gid_t* numbers = static_cast<gid_t*>(std::malloc(sizeof(gid_t)));
};

} // namespace

TEST(NameServiceTest, LocalNamesAndNumbersAreNotAskedAbout) {
    FakeWinbindd const winbindd([](std::uint32_t) { return FakeWinbindd::Silence(); });
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser("root")->status);
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser(uid_t{0})->status);
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindGroup("root")->status);
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindGroup(gid_t{0})->status);
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FoundGroups("root", 0).status);
    EXPECT_EQ(0U, winbindd.Connections());
}

TEST(NameServiceTest, AUserOfTheDomainIsFound) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(User("CORP\\user1", 2000001, 2000513)));
    for (auto const& found : {FindUser("CORP\\user1"), FindUser(uid_t{2000001})}) {
        ASSERT_EQ(NSS_STATUS_SUCCESS, found->status);
        EXPECT_STREQ("CORP\\user1", found->entry.pw_name);
        EXPECT_STREQ("*", found->entry.pw_passwd);
        EXPECT_EQ(2000001U, found->entry.pw_uid);
        EXPECT_EQ(2000513U, found->entry.pw_gid);
        EXPECT_STREQ("A User", found->entry.pw_gecos);
        EXPECT_STREQ("/home/CORP\\user1", found->entry.pw_dir);
        EXPECT_STREQ("/bin/sh", found->entry.pw_shell);
    }
}

TEST(NameServiceTest, AnotherSpellingOfALocalNameFindsNobody) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(User("root", 2000500, 2000513)));
    for (char const* const name : {"ROOT", "CORP\\root", "root@corp.example"}) {
        EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser(name)->status) << name;
    }
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser(uid_t{2000500})->status);
}

TEST(NameServiceTest, AUserWithALocalNumberIsNobody) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(User("CORP\\user1", 0, 2000513)));
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser("CORP\\user1")->status);
}

TEST(NameServiceTest, AUserWhosePrimaryGroupIsLocalIsNobody) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(User("CORP\\user1", 2000001, 0)));
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser("CORP\\user1")->status);
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser(uid_t{2000001})->status);
}

TEST(NameServiceTest, AGroupWithALocalNameOrNumberIsNone) {
    {
        FakeWinbindd const winbindd(FakeWinbindd::Greeting(Group("root", 2000600, 0, "")));
        EXPECT_EQ(NSS_STATUS_NOTFOUND, FindGroup("CORP\\root")->status);
        EXPECT_EQ(NSS_STATUS_NOTFOUND, FindGroup(gid_t{2000600})->status);
    }
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(Group("CORP\\admins", 0, 0, "")));
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindGroup("CORP\\admins")->status);
}

TEST(NameServiceTest, AMemberWithALocalNameIsLeftOut) {
    FakeWinbindd const winbindd(
        FakeWinbindd::Greeting(Group("CORP\\admins", 2000600, 3, "user1,root,user2")));
    auto const found = FindGroup("CORP\\admins");
    ASSERT_EQ(NSS_STATUS_SUCCESS, found->status);
    EXPECT_STREQ("CORP\\admins", found->entry.gr_name);
    EXPECT_EQ(2000600U, found->entry.gr_gid);
    EXPECT_THAT(found->Members(), ElementsAre("user1", "user2"));
}

TEST(NameServiceTest, ABufferThatIsTooSmallIsToBeLarger) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(User("CORP\\user1", 2000001, 2000513)));
    std::size_t const need = sizeof "CORP\\user1" + sizeof "*" + sizeof "A User" +
                             sizeof "/home/CORP\\user1" + sizeof "/bin/sh";
    for (std::size_t size = 0; size < need; ++size) {
        auto const found = FindUser("CORP\\user1", size);
        EXPECT_EQ(NSS_STATUS_TRYAGAIN, found->status) << size;
        EXPECT_EQ(ERANGE, found->error) << size;
    }
    EXPECT_EQ(NSS_STATUS_SUCCESS, FindUser("CORP\\user1", need)->status);
}

TEST(NameServiceTest, MembersAreAlignedWhereverTheBufferBegins) {
    FakeWinbindd const winbindd(
        FakeWinbindd::Greeting(Group("CORP\\admins", 2000600, 2, "user1,user2")));
    for (std::size_t begin = 0; begin < 2 * sizeof(char*); ++begin) {
        for (std::size_t size = begin; size < begin + 80; ++size) {
            auto const found = FindGroup("CORP\\admins", begin, size);
            if (found->status == NSS_STATUS_SUCCESS) {
                EXPECT_EQ(0U,
                          reinterpret_cast<std::uintptr_t>(found->entry.gr_mem) % sizeof(char*));
                EXPECT_THAT(found->Members(), ElementsAre("user1", "user2"));
            } else {
                EXPECT_EQ(ERANGE, found->error);
            }
        }
        EXPECT_EQ(NSS_STATUS_SUCCESS, FindGroup("CORP\\admins", begin)->status);
    }
}

TEST(NameServiceTest, TheGroupsOfAUserAreAddedOnce) {
    std::vector<gid_t> numbers = {2000513, 2000600, 0, 2000600};
    for (gid_t number = 2001000; number < 2001040; ++number) {
        numbers.push_back(number);
    }
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(Groups(numbers)));
    FoundGroups const found("CORP\\user1", 2000513);
    ASSERT_EQ(NSS_STATUS_SUCCESS, found.status);
    auto const all = found.Numbers();
    ASSERT_EQ(42U, all.size()); // not the local group 0
    EXPECT_EQ(2000513U, all[0]);
    EXPECT_EQ(2000600U, all[1]);
    EXPECT_EQ(2001039U, all[41]);
}

TEST(NameServiceTest, NoMoreGroupsAreAddedThanTheProcessTakes) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(Groups({1001001, 1001002, 1001003})));
    FoundGroups const found("CORP\\user1", 2000513, 3);
    EXPECT_EQ(NSS_STATUS_SUCCESS, found.status);
    EXPECT_THAT(found.Numbers(), ElementsAre(2000513U, 1001001U, 1001002U));
}

TEST(NameServiceTest, WithoutWinbinddTheServiceIsNotAvailable) {
    {
        FakeWinbindd const gone([](std::uint32_t) { return FakeWinbindd::Silence(); });
    }
    EXPECT_EQ(NSS_STATUS_UNAVAIL, FindUser("CORP\\user1")->status);
    EXPECT_EQ(NSS_STATUS_UNAVAIL, FindGroup("CORP\\admins")->status);
    EXPECT_EQ(NSS_STATUS_UNAVAIL, FoundGroups("CORP\\user1", 2000513).status);
}

TEST(NameServiceTest, WhomWinbinddDoesNotKnowIsNobody) {
    FakeWinbindd const winbindd(FakeWinbindd::Greeting(FakeWinbindd::Answer(FakeWinbindd::Error)));
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindUser("CORP\\nobody")->status);
    EXPECT_EQ(NSS_STATUS_NOTFOUND, FindGroup(gid_t{2000999})->status);
}
