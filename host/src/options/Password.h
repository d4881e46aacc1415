#pragma once

#include <optional>
#include <string>

namespace receiver {

/// The credential of the service manager that holds the password (systemd.exec(5), LoadCredential).
inline constexpr const char* kPasswordCredential = "receiver.password";
/// The environment variable that holds it.
inline constexpr const char* kPasswordVariable = "RECEIVER_PASSWORD";

/// The first line of `file`, which `name` introduces in sentences. Throws `ReceiverError` with `kUsage` when
/// there is none, and when everybody on the machine can read the file.
std::string ReadPasswordFile(const std::string& name, const std::string& file);

/// What stands in the credential, else in the variable; nothing where there is neither. Throws as
/// `ReadPasswordFile`.
std::optional<std::string> PasswordOfService();

/// Takes the variable out of the environment, and overwrites it where the list of processes shows it.
void HidePasswordVariable();

}  // namespace receiver
