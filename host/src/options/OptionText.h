#pragma once

namespace receiver {

/// What `--help` says above and below the list of options.
extern const char* const kHelpIntroduction;
extern const char* const kHelpFooter;

}  // namespace receiver
