#pragma once

#include <CLI/CLI.hpp>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace receiver {

/// A channel's configuration (TOML): each key is the name of an option without its dashes, each value what
/// would stand behind it on the command line, true or false for one that takes none. What stands on the
/// command line as well has precedence there.
class ConfigFile : public CLI::Config {
 public:
    /// `app` has all options when a file is read, and outlives this.
    explicit ConfigFile(const CLI::App& app) : app_(app) {}

    // CLI::Config

    /// Reads the file that the application's configuration option names. Throws `ReceiverError` (`kUsage`),
    /// "FILE:LINE:COLUMN: ..." for what is no TOML, for a name that no option has, and for a value that none
    /// can have.
    std::vector<CLI::ConfigItem> from_config(std::istream& input) const override;
    /// Nothing writes configurations.
    std::string to_config(const CLI::App* app, bool defaults, bool description,
                          std::string prefix) const override;

    /// "FILE:LINE:COLUMN: " of the option that `sentence` names first, when it was read here; else nothing.
    std::string PlaceOf(std::string_view sentence) const;

 private:
    const CLI::App& app_;
    /// Where each option, such as "--speed", was read that does not stand on the command line too.
    mutable std::map<std::string, std::string, std::less<>> places_;
};

}  // namespace receiver
