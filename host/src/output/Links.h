#pragma once

#include <string>

namespace receiver {

/// Whether `path`, which stands below `folder` by its name, is somewhere else, since it is a link or stands
/// behind one. A link that leads nowhere counts as one that does.
bool LeadsOutOf(const std::string& folder, const std::string& path);

}  // namespace receiver
