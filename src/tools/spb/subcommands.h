// The commands of spb, as the command line calls them. Each returns the exit status.
#pragma once

#include <string>
#include <vector>

struct PackOptions {
    std::string tree;
    std::string output;
    bool stored = false;
    std::vector<std::string> accepted; ///< codes of findings
};

struct CheckOptions {
    std::vector<std::string> files;
    std::vector<std::string> accepted;
    bool json = false;
};

/// What the commands that look at one package take.
struct FileOptions {
    std::string file;
    bool json = false;
};

struct DiffOptions {
    std::string from;
    std::string to;
    bool json = false;
};

struct ExtractOptions {
    std::string file;
    std::string directory;
};

struct SignOptions {
    std::string file;
    std::string key;
    std::string output; ///< empty: FILE.sig
};

struct SignatureOptions {
    std::string file;
    std::string signers;
    std::string signature; ///< empty: FILE.sig
    bool json = false;
};

int packCommand(const PackOptions& options);
int listCommand(const FileOptions& options);
int checkCommand(const CheckOptions& options);
int infoCommand(const FileOptions& options);
int diffCommand(const DiffOptions& options);
int extractCommand(const ExtractOptions& options);
int sbomCommand(const FileOptions& options);
int signCommand(const SignOptions& options);
int verifyCommand(const SignatureOptions& options);
