#include "installer_fixtures.h"
#include "process_limits.h"
#include "safe_path.h"
#include "selinux.h"
#include "toolkit_package.h"

#include <gtest/gtest.h>

#include <optional>

namespace {

class SelinuxTest : public MachineTest {
protected:
    /// Stand-ins for the SELinux tools, which write their arguments to "probe" and "label".
    void plantTools(int probeStatus, int labelStatus)
    {
        plantScript("/usr/sbin/selinuxenabled",
                    "echo \"$*\" >" + dir / "probe" + "; exit " + std::to_string(probeStatus));
        plantScript(dir / "chcon",
                    "echo \"$*\" >" + dir / "label" + "; exit " + std::to_string(labelStatus));
        chcon_.emplace(dir / "chcon", "/usr/bin/chcon");
    }

private:
    std::optional<FileInPlace> chcon_;
};

TEST_F(SelinuxTest, AMachineWithoutTheProbeGetsNoLabel)
{
    EXPECT_EQ(127 << 8, setSelinuxContext(dir.path()));

    EXPECT_EQ("Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 32512\n"
              "SELinux not enabled or not supported\n",
              log.text());
}

TEST_F(SelinuxTest, AMachineWhereItIsNotEnabledGetsNoLabel)
{
    plantTools(1, 0);

    EXPECT_EQ(1 << 8, setSelinuxContext(dir.path()));

    EXPECT_FALSE(pathExists(dir / "label"));
    EXPECT_EQ("Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 256\n"
              "SELinux not enabled or not supported\n",
              log.text());
}

TEST_F(SelinuxTest, TheBinariesAreLabelledWhereItIsEnabled)
{
    plantTools(0, 0);

    EXPECT_EQ(0, setSelinuxContext("/opt/corvan/zor"));

    EXPECT_EQ("\n", readFile(dir / "probe"));
    EXPECT_EQ("-R -t texrel_shlib_t /opt/corvan/zor/bin\n", readFile(dir / "label"));
    EXPECT_EQ("Exec '/usr/sbin/selinuxenabled >/dev/null 2>&1' returned 0\n"
              "Exec '/usr/bin/chcon -R -t texrel_shlib_t /opt/corvan/zor/bin >/dev/null 2>&1' "
              "returned 0\n",
              log.text());
}

TEST_F(SelinuxTest, TheStatusIsThatOfTheLabelling)
{
    plantTools(0, 2);

    EXPECT_EQ(2 << 8, setSelinuxContext("/opt/corvan/zor"));
}

} // namespace
