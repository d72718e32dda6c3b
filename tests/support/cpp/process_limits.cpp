#include "process_limits.h"

#include "test_files.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdio>
#include <future>
#include <iostream>
#include <iterator>
#include <memory>
#include <new>
#include <thread>

#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr __u32 RightsOfRoot =
    1U << CAP_DAC_OVERRIDE | 1U << CAP_DAC_READ_SEARCH | 1U << CAP_FOWNER;

/// Gets or sets (`call`) the capabilities of this thread.
void capabilities(long call, __user_cap_data_struct* data)
{
    __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
    EXPECT_EQ(0, syscall(call, &header, data));
}

/// Lets `program` decide about every system call of this process from now on.
void useFilter(const sock_fprog& program)
{
    ASSERT_EQ(0, prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0));
    ASSERT_EQ(0, prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program));
}

/// Waits for a system call that the filter of `listener` holds up, calls `act` and answers: the
/// call fails with the result of `act` or, if that is 0, is made.
void answerSystemCall(int listener, const std::function<int(long)>& act)
{
    seccomp_notif request = {};
    EXPECT_EQ(0, ioctl(listener, SECCOMP_IOCTL_NOTIF_RECV, &request));
    seccomp_notif_resp response = {};
    response.id = request.id;
    response.error = -act(request.data.nr);
    response.flags = response.error == 0 ? SECCOMP_USER_NOTIF_FLAG_CONTINUE : 0;
    EXPECT_EQ(0, ioctl(listener, SECCOMP_IOCTL_NOTIF_SEND, &response));
}

} // namespace

OrdinaryRights::OrdinaryRights()
{
    capabilities(SYS_capget, previous_);
    __user_cap_data_struct lowered[2] = {previous_[0], previous_[1]};
    lowered[0].effective &= ~RightsOfRoot;
    capabilities(SYS_capset, lowered);
}

OrdinaryRights::~OrdinaryRights()
{
    capabilities(SYS_capset, previous_);
}

SmallDisk::SmallDisk(const std::string& path, int kilobytes) : path_(path)
{
    const std::string size = "size=" + std::to_string(kilobytes) + "k";
    EXPECT_EQ(0, mount("tmpfs", path.c_str(), "tmpfs", 0, size.c_str()));
}

SmallDisk::~SmallDisk()
{
    EXPECT_EQ(0, umount(path_.c_str()));
}

FileInPlace::FileInPlace(const std::string& source, const std::string& target) : target_(target)
{
    EXPECT_EQ(0, mount(source.c_str(), target.c_str(), nullptr, MS_BIND, nullptr));
}

FileInPlace::~FileInPlace()
{
    EXPECT_EQ(0, umount(target_.c_str()));
}

bool passesInChild(const std::function<void()>& body)
{
    std::cout.flush();
    (void)std::fflush(nullptr);
    const pid_t child = fork();
    if (child == 0) {
        body();
        std::cout.flush();
        (void)std::fflush(nullptr);
        _exit(::testing::Test::HasFailure() ? 1 : 0);
    }
    int status = -1;
    EXPECT_EQ(child, waitpid(child, &status, 0));
    return status == 0;
}

void becomeUser(uid_t uid)
{
    const std::string map = std::to_string(uid) + " " + std::to_string(getuid()) + " 1";
    ASSERT_EQ(0, unshare(CLONE_NEWUSER));
    writeFile("/proc/self/uid_map", map);
    ASSERT_EQ(uid, getuid());
}

void watchSystemCalls(const std::vector<long>& numbers, const std::function<int(long)>& act)
{
    // Started before the filter exists, so that its own system calls are not held up.
    const auto promise = std::make_shared<std::promise<int>>();
    std::thread([promise, act] {
        const int listener = promise->get_future().get();
        for (;;)
            answerSystemCall(listener, act);
    }).detach();

    std::vector<sock_filter> program = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, static_cast<__u32>(offsetof(seccomp_data, nr)))};
    for (const long number : numbers) {
        program.push_back(BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<__u32>(number), 0, 1));
        program.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_USER_NOTIF));
    }
    program.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW));
    const sock_fprog filter = {static_cast<unsigned short>(program.size()), program.data()};
    ASSERT_EQ(0, prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0));
    const long listener =
        syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, SECCOMP_FILTER_FLAG_NEW_LISTENER, &filter);
    ASSERT_LE(0, listener);
    promise->set_value(static_cast<int>(listener));
}

void beforeSystemCall(const std::vector<long>& numbers, int nth, const std::function<int()>& act)
{
    watchSystemCalls(numbers, [call = 0, nth, act](long /*number*/) mutable {
        return ++call == nth ? act() : 0;
    });
}

bool takeMemory(std::size_t size)
{
    if (WZOR_SANITIZE != 0)
        return false;
    const rlimit none = {};
    EXPECT_EQ(0, setrlimit(RLIMIT_AS, &none));
    while (::operator new(size, std::nothrow) != nullptr) { // what was freed before
    }
    return true;
}

std::vector<long> statusCalls()
{
    return {
        SYS_fstat,      SYS_statx,
#ifdef SYS_newfstatat
        SYS_newfstatat,
#endif
#ifdef SYS_fstat64
        SYS_fstat64,    SYS_fstatat64,
#endif
    };
}

void changeEffectiveUser()
{
#ifdef SYS_geteuid32
    const __u32 wanted = SYS_geteuid32;
#else
    const __u32 wanted = SYS_geteuid;
#endif
    // Without a second id in the sandbox's user namespace there is none to change to: the system
    // call fails, which geteuid() returns like an id.
    sock_filter program[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, static_cast<__u32>(offsetof(seccomp_data, nr))),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, wanted, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | EPERM),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
    };
    useFilter({static_cast<unsigned short>(std::size(program)), program});
    ASSERT_NE(0U, geteuid());
}

void failSystemCall(long number, int error)
{
    const auto wanted = static_cast<__u32>(number);
    const auto answer = SECCOMP_RET_ERRNO | static_cast<__u32>(error);
    sock_filter program[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, static_cast<__u32>(offsetof(seccomp_data, nr))),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, wanted, 0, 3),
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, static_cast<__u32>(offsetof(seccomp_data, args))),
        BPF_JUMP(BPF_JMP | BPF_JGT | BPF_K, 2, 0, 1),
        BPF_STMT(BPF_RET | BPF_K, answer),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
    };
    useFilter({static_cast<unsigned short>(std::size(program)), program});
}
