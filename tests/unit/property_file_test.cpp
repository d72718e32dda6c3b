#include "installer_fixtures.h"
#include "process_limits.h"
#include "property_file.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include <sys/stat.h>
#include <unistd.h>

namespace {

using Lines = std::vector<std::string>;

class PropertyFileTest : public InstallerTest {
protected:
    PropertyFile loaded(const std::string& content)
    {
        writeFile(path, content);
        PropertyFile file;
        EXPECT_EQ(0, file.load(path));
        return file;
    }

    std::string path = dir / "Zor.properties";
};

// Loading and saving.

TEST_F(PropertyFileTest, EveryLineSurvivesALoadAndSave)
{
    const PropertyFile file = loaded("a = 1\n#b=2\n\nc=3");
    EXPECT_EQ((Lines{"a = 1", "#b=2", "", "c=3"}), file.lines);

    EXPECT_EQ(0, file.save(path));
    EXPECT_EQ("a = 1\n#b=2\n\nc=3\n", readFile(path));
    EXPECT_EQ("", log.text());
}

TEST_F(PropertyFileTest, AFinalNewlineMakesNoLine)
{
    EXPECT_EQ((Lines{"a"}), loaded("a\n").lines);
    EXPECT_EQ((Lines{"a", ""}), loaded("a\n\n").lines);
    EXPECT_EQ(Lines{}, loaded("").lines);
}

TEST_F(PropertyFileTest, CarriageReturnAndNulStayInTheLine)
{
    EXPECT_EQ((Lines{"a=1\r", std::string("b\0c", 3)}),
              loaded(std::string("a=1\r\nb\0c\n", 9)).lines);
}

TEST_F(PropertyFileTest, LoadingReplacesTheLines)
{
    PropertyFile file{{"old"}};
    writeFile(path, "new\n");

    EXPECT_EQ(0, file.load(path));

    EXPECT_EQ(Lines{"new"}, file.lines);
}

TEST_F(PropertyFileTest, AMissingFileIsLoggedAndHoldsNoLines)
{
    PropertyFile file{{"old"}};

    EXPECT_EQ(2, file.load(path));

    EXPECT_EQ(Lines{}, file.lines);
    EXPECT_EQ("Loading file " + path + " error: 2 (No such file or directory)\n", log.text());
}

TEST_F(PropertyFileTest, AFileThatMayNotBeReadIsLogged)
{
    writeFile(path, "a=1\n");
    ASSERT_EQ(0, chmod(path.c_str(), 0));
    const OrdinaryRights ordinary;
    PropertyFile file;

    EXPECT_EQ(13, file.load(path));

    EXPECT_EQ("Loading file " + path + " error: 13 (Permission denied)\n", log.text());
}

TEST_F(PropertyFileTest, ADirectoryLoadsAsNoLines)
{
    PropertyFile file{{"old"}};

    EXPECT_EQ(0, file.load(dir.path()));

    EXPECT_EQ(Lines{}, file.lines);
    EXPECT_EQ("", log.text());
}

TEST_F(PropertyFileTest, AFileThatCannotBeReadToItsEndHoldsNoLines)
{
    PropertyFile file{{"old"}};

    EXPECT_EQ(5, file.load("/proc/self/mem")); // opens; its first page is not there

    EXPECT_EQ(Lines{}, file.lines);
    EXPECT_EQ("Loading file /proc/self/mem error: 5 (Input/output error)\n", log.text());
}

TEST_F(PropertyFileTest, SavingTruncatesTheFile)
{
    writeFile(path, "a long line of before\n");

    EXPECT_EQ(0, (PropertyFile{{"a"}}.save(path)));

    EXPECT_EQ("a\n", readFile(path));
}

TEST_F(PropertyFileTest, NoLinesMakeAnEmptyFile)
{
    EXPECT_EQ(0, PropertyFile().save(path));

    EXPECT_EQ("", readFile(path));
}

TEST_F(PropertyFileTest, ANulIsSaved)
{
    EXPECT_EQ(0, (PropertyFile{{std::string("a\0b", 3)}}.save(path)));

    EXPECT_EQ(std::string("a\0b\n", 4), readFile(path));
}

TEST_F(PropertyFileTest, AFileThatCannotBeWrittenIsLogged)
{
    const std::string missing = dir / "missing/file";

    EXPECT_EQ(2, (PropertyFile{{"a"}}.save(missing)));

    EXPECT_EQ("Saving file " + missing + " error: 2 (No such file or directory)\n", log.text());
}

TEST_F(PropertyFileTest, ADirectoryCannotBeSavedOver)
{
    EXPECT_EQ(21, (PropertyFile{{"a"}}.save(dir.path())));

    EXPECT_EQ("Saving file " + dir.path() + " error: 21 (Is a directory)\n", log.text());
}

TEST_F(PropertyFileTest, AFailingWriteIsNotDetected)
{
    EXPECT_EQ(0, (PropertyFile{{"a", "b"}}.save("/dev/full")));

    EXPECT_EQ("", log.text());
}

// Queries.

TEST_F(PropertyFileTest, AValueIsTheTrimmedTextAfterTheFirstEqualsSign)
{
    PropertyFile file{{"a = 1", "b=x=y ", "c=", "\td e\t=\tf g\r"}};

    EXPECT_EQ("1", file.getValue("a"));
    EXPECT_EQ("x=y", file.getValue("b"));
    EXPECT_EQ("", file.getValue("c"));
    EXPECT_EQ("f g", file.getValue("d e"));
}

TEST_F(PropertyFileTest, AValueOfBlanksIsNotTrimmed)
{
    EXPECT_EQ("  ", (PropertyFile{{"a=  "}}.getValue("a")));
}

TEST_F(PropertyFileTest, AnAbsentKeyHasAnEmptyValue)
{
    const PropertyFile file{{"#b=2", "bb=3", "B=4"}};

    EXPECT_EQ("", file.getValue("b"));
}

TEST_F(PropertyFileTest, TheFirstLineOfAKeyGivesItsValue)
{
    EXPECT_EQ("1", (PropertyFile{{"x=1", "x=2"}}.getValue("x")));
}

TEST_F(PropertyFileTest, ALineWithoutAnEqualsSignHasNoValue)
{
    EXPECT_EQ("2", (PropertyFile{{"x", "x=2"}}.getValue("x")));
    EXPECT_EQ("", (PropertyFile{{"x"}}.getValue("x")));
}

TEST_F(PropertyFileTest, TheLastLineOfAKeyIsFound)
{
    PropertyFile file{{"x=1", " x = 2", "y=3"}};

    EXPECT_EQ(&file.lines[1], file.findLine("x"));
}

TEST_F(PropertyFileTest, ALineWithoutAnEqualsSignIsFoundByItsWholeText)
{
    PropertyFile file{{"x=1", "\tx y ", "z"}};

    EXPECT_EQ(&file.lines[1], file.findLine("x y"));
    EXPECT_EQ(&file.lines[0], file.findLine("x"));
}

TEST_F(PropertyFileTest, AnAbsentKeyHasNoLine)
{
    PropertyFile file{{"x=1", "#y=2"}};

    EXPECT_EQ(nullptr, file.findLine("y"));
    EXPECT_EQ(nullptr, file.findLine("X"));
    EXPECT_EQ(nullptr, file.findLine(""));
}

TEST_F(PropertyFileTest, AnEmptyLineIsTheLineOfTheEmptyKey)
{
    PropertyFile file{{"", "x=1"}};

    EXPECT_EQ(&file.lines[0], file.findLine(""));
}

// Changes.

TEST_F(PropertyFileTest, SettingAValueRewritesTheLineWithoutBlanks)
{
    PropertyFile file{{"  a = 1  ", "#a=2", "aa=3"}};

    EXPECT_EQ(1, file.setValue("a", "5"));

    EXPECT_EQ((Lines{"a=5", "#a=2", "aa=3"}), file.lines);
}

TEST_F(PropertyFileTest, SettingAValueRewritesEveryLineOfTheKey)
{
    PropertyFile file{{"x=1", "y=2", "x=3"}};

    EXPECT_EQ(2, file.setValue("x", "new"));

    EXPECT_EQ((Lines{"x=new", "y=2", "x=new"}), file.lines);
}

TEST_F(PropertyFileTest, ANewValueIsNotTrimmed)
{
    PropertyFile file{{"a=1"}};

    EXPECT_EQ(1, file.setValue("a", " v = w "));

    EXPECT_EQ(Lines{"a= v = w "}, file.lines);
}

TEST_F(PropertyFileTest, SettingAnAbsentKeyAddsNothing)
{
    PropertyFile file{{"a=1"}};

    EXPECT_EQ(0, file.setValue("b", "2"));

    EXPECT_EQ(Lines{"a=1"}, file.lines);
}

TEST_F(PropertyFileTest, SettingAValueGivesALineWithoutAnEqualsSignOne)
{
    PropertyFile file{{" a "}};

    EXPECT_EQ(1, file.setValue("a", "5"));

    EXPECT_EQ(Lines{"a=5"}, file.lines);
}

TEST_F(PropertyFileTest, AFragmentMatchesEveryKeyThatContainsIt)
{
    PropertyFile file{
        {" trace.level = 1", "fscanner.tracefile=f", "#trace.level=1", "level=trace", "trace"}};

    EXPECT_EQ(4, file.setValueWhereKeyContains("trace", "0"));

    EXPECT_EQ((Lines{"trace.level=0", "fscanner.tracefile=0", "#trace.level=0", "level=trace",
                     "trace=0"}),
              file.lines);
}

TEST_F(PropertyFileTest, AFragmentThatNoKeyContainsChangesNothing)
{
    PropertyFile file{{"a=b", "A=c"}};

    EXPECT_EQ(0, file.setValueWhereKeyContains("b", "0"));

    EXPECT_EQ((Lines{"a=b", "A=c"}), file.lines);
}

TEST_F(PropertyFileTest, ClearingLeavesAnEmptyLine)
{
    PropertyFile file{{"a=1", "fscanner.changepriority=normal", "b=priority", "priority", "c=2"}};

    EXPECT_EQ(2, file.clearWhereKeyContains("priority"));

    EXPECT_EQ((Lines{"a=1", "", "b=priority", "", "c=2"}), file.lines);
}

TEST_F(PropertyFileTest, ClearingWhatIsNotThereChangesNothing)
{
    PropertyFile file{{"a=1"}};

    EXPECT_EQ(0, file.clearWhereKeyContains("b"));

    EXPECT_EQ(Lines{"a=1"}, file.lines);
}

TEST_F(PropertyFileTest, TextIsReplacedInEveryLineAndPlace)
{
    PropertyFile file{{"$(x)=$(x)/$(x)", "none", "# $(x)"}};

    EXPECT_EQ(4, file.replaceText("$(x)", "/opt"));

    EXPECT_EQ((Lines{"/opt=/opt//opt", "none", "# /opt"}), file.lines);
}

TEST_F(PropertyFileTest, TheSearchForTextRestartsAtTheStartOfTheLine)
{
    PropertyFile file{{"aab", "ab"}};

    EXPECT_EQ(3, file.replaceText("ab", "b"));

    EXPECT_EQ((Lines{"b", "b"}), file.lines);
}

TEST_F(PropertyFileTest, ADumpPrintsTheLinesOnStandardOutput)
{
    const PropertyFile file{{"a = 1", "", "b"}};

    testing::internal::CaptureStdout();
    file.dump();

    EXPECT_EQ("a = 1\n\nb\n", testing::internal::GetCapturedStdout());
    EXPECT_EQ("", log.text());
}

TEST_F(PropertyFileTest, ALineOfAConstantFileCanBeFound)
{
    const PropertyFile file{{"x=1", "x=2"}};

    EXPECT_EQ(&file.lines[1], file.findLine("x"));
    EXPECT_EQ(nullptr, file.findLine("y"));
}

// Editing on the disk.

TEST_F(PropertyFileTest, AnEditedFileIsSaved)
{
    writeFile(path, "a=1\n");

    EXPECT_EQ(0, editPropertyFile(path, [](PropertyFile& file) { file.setValue("a", "2"); }));

    EXPECT_EQ("a=2\n", readFile(path));
    EXPECT_EQ("", log.text());
}

TEST_F(PropertyFileTest, AFileThatCannotBeLoadedIsNotEdited)
{
    EXPECT_EQ(2, editPropertyFile(path, [](PropertyFile&) { ADD_FAILURE(); }));

    EXPECT_EQ("Loading file " + path +
                  " error: 2 (No such file or directory)\nCould not load property file\n",
              log.text());
}

TEST_F(PropertyFileTest, AnEditedFileThatCannotBeSavedIsLogged)
{
    writeFile(path, "a=1\n");
    ASSERT_EQ(0, chmod(path.c_str(), 0444));
    {
        const OrdinaryRights rights;
        EXPECT_EQ(13, editPropertyFile(path, [](PropertyFile& file) { file.setValue("a", "2"); }));
    }

    EXPECT_EQ("Saving file " + path +
                  " error: 13 (Permission denied)\nCould not save property file\n",
              log.text());
    EXPECT_EQ("a=1\n", readFile(path));
}

TEST_F(PropertyFileTest, ACustomizationIsLogged)
{
    writeFile(path, "a=1\n");

    EXPECT_EQ(0, customizePropertyFile(path, [](PropertyFile& file) { file.lines.clear(); }));

    EXPECT_EQ("Customizing property file: " + path + "\n", log.text());
    EXPECT_EQ("", readFile(path));
}

} // namespace
