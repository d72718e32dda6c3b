#include "findings.h"

#include <gtest/gtest.h>

namespace {

TEST(Findings, TheWorstKindIsRemembered)
{
    Findings findings;
    EXPECT_EQ(findings.worst(), std::nullopt);

    findings.add("encrypted", "a", "");
    findings.add("zip64", std::nullopt, "");

    EXPECT_EQ(findings.worst(), Kind::Damaged);
}

TEST(Findings, AnAcceptedCodeIsNotTakenIn)
{
    Findings findings({"empty-file"});

    findings.add("empty-file", "a", "");
    findings.add("duplicate", "b", "");

    ASSERT_EQ(findings.kept().size(), 1U);
    EXPECT_EQ(findings.kept()[0].code, "duplicate");
    EXPECT_EQ(findings.worst(), Kind::Surprises);
}

TEST(Findings, OnlyTheFirstTenThousandAreKeptAndTheWorstOfAllCounts)
{
    Findings findings;

    for (int i = 0; i < 10000; ++i)
        findings.add("duplicate", "a", "");
    findings.add("empty-file", "b", "");

    EXPECT_EQ(findings.kept().size(), 10000U);
    EXPECT_EQ(findings.omitted(), 1U);
    EXPECT_EQ(findings.worst(), Kind::Fails);
}

TEST(Findings, ALineIsSafeToPrint)
{
    const Finding finding = {"empty-file", "a\n\x1b[31m\xff", "is empty"};

    EXPECT_EQ(finding.line(), "fails: empty-file: a\\n\\x1b[31m\\xff: is empty");
}

TEST(Findings, AFindingAboutTheArchiveNamesNoEntry)
{
    const Finding finding = {"zip64", std::nullopt, "text"};

    EXPECT_EQ(finding.line(), "surprises: zip64: text");
}

TEST(Findings, AnUnknownCodeHasNoKind)
{
    EXPECT_EQ(kindOf("no-such-code"), std::nullopt);
    EXPECT_EQ(kindOf("crc-mismatch"), Kind::Damaged);
}

} // namespace
