// Detached signatures by ssh-keygen, which every administrator has: namespace "spb".
#pragma once

#include <string>

inline constexpr const char* SignatureNamespace = "spb";

/// What verifySignature() finds.
enum SignatureCode : int {
    SignatureGood = 0,
    SignatureBad = 1,     ///< it is none of this file, or of nobody who is allowed
    SignatureUnknown = 2, ///< could not be found out; standard error says why
};

/// Verifies the signature at `signature` of the open file `fd` by the ssh-keygen(1) list
/// `allowedSigners`. Of a good one, `principal` gets who has signed. What ssh-keygen prints goes to
/// the descriptor `messages`.
[[nodiscard]] int verifySignature(int fd, const std::string& signature,
                                  const std::string& allowedSigners, int messages,
                                  std::string& principal);

/// Signs the open file `fd` with the key at `key`, for which ssh-keygen may ask; writes the
/// signature to `output`. Returns true, or false when ssh-keygen has complained.
[[nodiscard]] bool signFile(int fd, const std::string& key, int output);
