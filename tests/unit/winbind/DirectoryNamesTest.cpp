// SPDX-License-Identifier: Apache-2.0
#include "text/DirectoryNames.h"

#include "Failure.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using namespace tessel::winbind;

namespace {

using Texts = std::vector<std::string>;

template <typename Call> void ExpectFailure(ActiveDirectoryClientErrorCode code, Call const& call) {
    try {
        call();
        ADD_FAILURE() << "taken";
    } catch (Failure const& failure) {
        EXPECT_EQ(failure.Code(), code) << failure.what();
    }
}

OrganisationalUnit Unit(std::string const& unit) {
    return ReadOrganisationalUnit(unit, "corp.example");
}

TEST(DirectoryNamesTest, DomainNamesAreLowerCaseWithoutAFinalDot) {
    EXPECT_EQ(DomainName("corp.example"), "corp.example");
    EXPECT_EQ(DomainName("Corp.EXAMPLE."), "corp.example");
    EXPECT_EQ(DomainName("a-b.c_d.x1"), "a-b.c_d.x1");
    EXPECT_EQ(DomainName("CORP"), "corp");
    EXPECT_EQ(DomainName(std::string(63, 'a') + ".b"), std::string(63, 'a') + ".b");
}

TEST(DirectoryNamesTest, WhatIsNoDomainNameIsRefused) {
    for (std::string const& name :
         Texts{"", ".", "..", "a..b", ".a", "a b", "-a.b", "a-.b", "a/b", "a\n", "a%b", "10.99.0.1",
               "a.5", "\xc3\xa4.example", std::string(64, 'a') + ".b", "a=b", "a\\b", "a;b", "*"}) {
        SCOPED_TRACE(name);
        ExpectFailure(1212, [&] { (void)DomainName(name); });
        ExpectFailure(1212, [&] { (void)DomainDistinguishedName(name); });
    }
    std::string longName;
    for (int i = 0; i < 64; ++i) {
        longName += "abc.";
    }
    ExpectFailure(1212, [&] { (void)DomainName(longName); });
    EXPECT_EQ(DomainName(longName.substr(4)), longName.substr(4, 251));
}

TEST(DirectoryNamesTest, TheComputerNameIsTheFirstLabelInCapitals) {
    EXPECT_EQ(ComputerName("host1"), "HOST1");
    EXPECT_EQ(ComputerName("Host-1.corp.example"), "HOST-1");
    EXPECT_EQ(ComputerName("abcdefghijklmno"), "ABCDEFGHIJKLMNO");
    EXPECT_EQ(ComputerName("1a"), "1A");
}

TEST(DirectoryNamesTest, AHostNameThatNoAccountCanHaveIsRefused) {
    for (std::string const& name :
         Texts{"", ".corp.example", "abcdefghijklmnop", "123", "123.corp.example", "a_b", "-a",
               "a-", "a b", "a$", "h\xc3\xb6st", "a\n", "(none)"}) {
        SCOPED_TRACE(name);
        ExpectFailure(1210, [&] { (void)ComputerName(name); });
    }
}

TEST(DirectoryNamesTest, ADomainHasADistinguishedName) {
    EXPECT_EQ(DomainDistinguishedName("Corp.Example."), "DC=corp,DC=example");
    EXPECT_EQ(DomainDistinguishedName("corp"), "DC=corp");
}

TEST(DirectoryNamesTest, AUnitIsAPathFromTopToBottom) {
    EXPECT_EQ(Unit("Servers/Linux").relative, "OU=Linux,OU=Servers");
    EXPECT_EQ(Unit("Servers/Linux").distinguishedName, "OU=Linux,OU=Servers,DC=corp,DC=example");
    EXPECT_EQ(Unit("Servers").distinguishedName, "OU=Servers,DC=corp,DC=example");
    EXPECT_EQ(Unit("Domain Controllers").relative, "OU=Domain Controllers");
}

TEST(DirectoryNamesTest, NamesInAPathAreEscapedInTheDistinguishedName) {
    EXPECT_EQ(Unit("R&D, \"big\"/a+b;c<d>").relative, "OU=a\\+b\\;c\\<d\\>,OU=R&D\\, \\\"big\\\"");
    EXPECT_EQ(Unit(R"(TCP\/IP/back\\slash)").relative, R"(OU=back\\slash,OU=TCP/IP)");
    EXPECT_EQ(Unit("#1/ x ").relative, R"(OU=\ x\ ,OU=\#1)");
    EXPECT_EQ(Unit("B\xc3\xbcro").relative, "OU=B\xc3\xbcro");
    EXPECT_EQ(Unit("a, b=c").relative, "OU=a\\, b\\=c");
}

TEST(DirectoryNamesTest, TheContainerForComputersIsTheOneNameThatIsNoUnit) {
    EXPECT_EQ(Unit("computers").relative, "CN=computers");
    EXPECT_EQ(Unit("Servers/Computers").relative, "OU=Computers,OU=Servers");
}

TEST(DirectoryNamesTest, AUnitIsADistinguishedNameWithTheDomainsPartOrWithout) {
    for (std::string const& unit :
         Texts{"OU=Linux,OU=Servers", "ou=Linux, Ou = Servers",
               "OU=Linux,OU=Servers,DC=corp,DC=example", "OU=Linux,OU=Servers,dc=CORP,dc=Example",
               R"(OU=\4cinux,OU=Servers)"}) {
        EXPECT_EQ(Unit(unit).relative, "OU=Linux,OU=Servers") << unit;
        EXPECT_EQ(Unit(unit).distinguishedName, "OU=Linux,OU=Servers,DC=corp,DC=example") << unit;
    }
    EXPECT_EQ(Unit("CN=Computers").relative, "CN=Computers");
}

TEST(DirectoryNamesTest, EscapesInADistinguishedNameAreKept) {
    EXPECT_EQ(Unit(R"(OU=R\2CD\, x,OU=\ a\ ,OU=\#b)").relative, R"(OU=R\,D\, x,OU=\ a\ ,OU=\#b)");
    EXPECT_EQ(Unit("OU=a=b").relative, "OU=a\\=b");
    EXPECT_EQ(Unit("OU=A/B").relative, "OU=A/B");
    EXPECT_EQ(Unit(R"(OU=\c3\bc)").relative, "OU=\xc3\xbc");
}

TEST(DirectoryNamesTest, AMalformedUnitIsRefused) {
    for (std::string const& unit : Texts{"",
                                         "/",
                                         "/A",
                                         "A/",
                                         "A//B",
                                         "A\\B",
                                         "A\\",
                                         "A\nB",
                                         std::string("A\0B", 3),
                                         std::string(65, 'a'),
                                         "OU=",
                                         "OU=A,",
                                         "OU=A,,OU=B",
                                         "OU=A,B",
                                         "=A",
                                         "==,=",
                                         "OU=A+CN=B",
                                         "OU=\"A\"",
                                         "OU=#4142",
                                         "OU=A\\",
                                         "OU=A\\g",
                                         "OU=A;OU=B",
                                         "OU=<A>",
                                         "UID=a",
                                         "2.5.4.11=A",
                                         "OU=A\\0a",
                                         "DC=corp,DC=example",
                                         "OU=A,DC=other,DC=example",
                                         "OU=A,DC=example",
                                         "OU=A,DC=corp,DC=example,OU=B",
                                         "OU=A,DC=corp,DC=example,",
                                         "OU=A,DC=x,DC=corp,DC=example",
                                         "OU=" + std::string(65, 'a')}) {
        SCOPED_TRACE(unit);
        ExpectFailure(87, [&] { (void)Unit(unit); });
    }
    ExpectFailure(1212, [] { (void)ReadOrganisationalUnit("A", "not a domain"); });
}

TEST(DirectoryNamesTest, AUnitThatWasWrittenIsReadAgainAsTheSame) {
    for (std::string const& unit :
         Texts{"A/B", "R&D, x/#1/ y ", R"(TCP\/IP/a\\b)", "x y=b", "x\"<>;+"}) {
        EXPECT_EQ(Unit(Unit(unit).relative).relative, Unit(unit).relative);
        EXPECT_EQ(Unit(Unit(unit).distinguishedName).distinguishedName,
                  Unit(unit).distinguishedName);
    }
}

TEST(DirectoryNamesTest, ACanonicalNameIsTakenApart) {
    UserName const user = ReadUserName("corp.example/People/Sales/Jo Doe");
    EXPECT_EQ(user.form, UserName::Form::canonical);
    EXPECT_EQ(user.domain, "corp.example");
    EXPECT_EQ(user.containers, (Texts{"People", "Sales"}));
    EXPECT_EQ(user.name, "Jo Doe");
    EXPECT_EQ(CanonicalDistinguishedName(user), "CN=Jo Doe,OU=Sales,OU=People,DC=corp,DC=example");
}

TEST(DirectoryNamesTest, ACanonicalNameMayHoldEscapedSlashesAndBackslashes) {
    UserName const user = ReadUserName(R"(corp.example/TCP\/IP/a\b\\c@d)");
    EXPECT_EQ(user.form, UserName::Form::canonical);
    EXPECT_EQ(user.containers, (Texts{"TCP/IP"}));
    EXPECT_EQ(user.name, R"(a\b\c@d)");
}

TEST(DirectoryNamesTest, ACanonicalNameMayHaveNoContainer) {
    UserName const user = ReadUserName("corp.example/Users/user1");
    EXPECT_EQ(CanonicalDistinguishedName(user), "CN=user1,CN=Users,DC=corp,DC=example");
    EXPECT_EQ(CanonicalDistinguishedName(ReadUserName("corp.example/user1")),
              "CN=user1,DC=corp,DC=example");
}

TEST(DirectoryNamesTest, ADownLevelNameIsTakenApart) {
    UserName const user = ReadUserName("CORP\\user1");
    EXPECT_EQ(user.form, UserName::Form::downLevel);
    EXPECT_EQ(user.domain, "CORP");
    EXPECT_EQ(user.name, "user1");
    EXPECT_EQ(ReadUserName("CORP\\jo doe.x").name, "jo doe.x");
    EXPECT_EQ(ReadUserName("CORP\\j\xc3\xb6").name, "j\xc3\xb6");
    EXPECT_EQ(ReadUserName("CORP\\a@b").name, "a@b");
}

TEST(DirectoryNamesTest, APrincipalIsTakenApartAtItsLastAt) {
    UserName const user = ReadUserName("user1@corp.example");
    EXPECT_EQ(user.form, UserName::Form::principal);
    EXPECT_EQ(user.domain, "corp.example");
    EXPECT_EQ(user.name, "user1");
    EXPECT_EQ(ReadUserName("a@b@corp.example").name, "a@b");
}

TEST(DirectoryNamesTest, WhatIsNoUserNameIsRefused) {
    for (std::string const& name : Texts{"",
                                         "user1",
                                         "\\",
                                         "CORP\\",
                                         "\\user1",
                                         "CORP\\a\\b",
                                         "CORP\\a/b",
                                         "@",
                                         "a@",
                                         "@b",
                                         "a@b c",

                                         "corp.example/",
                                         "corp.example//a",
                                         "corp.example/a/",
                                         "/a",
                                         "not a domain/a",
                                         "CORP\\a\n",
                                         "corp.example/a\n",
                                         "CO RP\\a",
                                         "CORP\\*",
                                         "a*@corp.example",
                                         std::string("CORP\\a\0b", 8)}) {
        SCOPED_TRACE(name);
        ExpectFailure(1315, [&] { (void)ReadUserName(name); });
    }
}

TEST(DirectoryNamesTest, WhatAFilterCannotHoldIsEscaped) {
    EXPECT_EQ(EscapedForFilter("a*(b)\\c\n\x7f"), "a\\2a\\28b\\29\\5cc\\0a\\7f");
    EXPECT_EQ(EscapedForFilter(std::string("\0", 1)), "\\00");
    EXPECT_EQ(EscapedForFilter("j\xc3\xb6 doe"), "j\xc3\xb6 doe");
}

TEST(DirectoryNamesTest, ATextOfAFailureIsOneShortLine) {
    try {
        (void)DomainName("a\nb" + std::string(5000, 'x'));
        ADD_FAILURE() << "taken";
    } catch (Failure const& failure) {
        std::string const text = failure.what();
        EXPECT_EQ(text.find('\n'), std::string::npos);
        EXPECT_LT(text.size(), 400U);
    }
}

} // namespace
