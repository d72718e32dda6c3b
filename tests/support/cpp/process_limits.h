// Limits that a test sets for its own process: rights, identity, system calls, room on a disk.
#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

#include <linux/capability.h>
#include <sys/types.h>

/// Makes root respect permission bits like any other user while it lives; without effect for other
/// users, who do so anyway.
class OrdinaryRights {
public:
    OrdinaryRights();
    OrdinaryRights(const OrdinaryRights&) = delete;
    OrdinaryRights& operator=(const OrdinaryRights&) = delete;
    ~OrdinaryRights();

private:
    __user_cap_data_struct previous_[2] = {};
};

/// A file system of `kilobytes` at the existing directory `path` while it lives. Needs the rights
/// that root has in tests/support/sandbox.
class SmallDisk {
public:
    SmallDisk(const std::string& path, int kilobytes);
    SmallDisk(const SmallDisk&) = delete;
    SmallDisk& operator=(const SmallDisk&) = delete;
    ~SmallDisk();

private:
    std::string path_;
};

/// Shows the file `source` at the path of the existing file `target` while it lives. Needs the
/// rights that root has in tests/support/sandbox.
class FileInPlace {
public:
    FileInPlace(const std::string& source, const std::string& target);
    FileInPlace(const FileInPlace&) = delete;
    FileInPlace& operator=(const FileInPlace&) = delete;
    ~FileInPlace();

private:
    std::string target_;
};

/// Runs `body` in a child process, so that what it does to its process ends with it. Returns true
/// when the child ended by itself and no expectation in it failed; its failures are printed.
bool passesInChild(const std::function<void()>& body);

/// Makes this process that of the user `uid`, who owns the same files. For a child only.
void becomeUser(uid_t uid);

/// Makes the system call `number` (SYS_...) fail with `error` from now on, unless its first
/// argument is 0 to 2, a standard stream. For a child only.
void failSystemCall(long number, int error);

/// Calls `act` with the number of the call before each of this thread's system calls from now on
/// that is one of `numbers`. The call then fails with the `errno` that `act` returned; 0: it is
/// made as usual. For a child only, and once in it.
void watchSystemCalls(const std::vector<long>& numbers, const std::function<int(long)>& act);

/// As watchSystemCalls(), for the `nth` of those calls alone.
void beforeSystemCall(const std::vector<long>& numbers, int nth, const std::function<int()>& act);

/// Leaves this process no memory for pieces of `size` bytes or more. Returns false, and leaves
/// all, under the address sanitizer, which ends a process that gets none. For a child only.
[[nodiscard]] bool takeMemory(std::size_t size);

/// The numbers of the system calls that return the status of a file.
std::vector<long> statusCalls();

/// Makes geteuid() return an id that is not root's from now on. For a child only.
void changeEffectiveUser();
