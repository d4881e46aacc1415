#include "platform/Directories.h"

#include <boost/filesystem/detail/utf8_codecvt_facet.hpp>
#include <boost/filesystem/operations.hpp>
#include <boost/filesystem/path.hpp>
#include <locale>

namespace clipfileModule {

namespace {

/// A path whose bytes count as UTF-8 wherever the system wants wide characters.
boost::filesystem::path utf8Path(const std::string& nativePath) {
    // Contract: locale-set-once. It belongs to all paths of the process, and changing it while another thread
    // uses one is a race.
    static const std::locale previous = boost::filesystem::path::imbue(
        std::locale(std::locale(), new boost::filesystem::detail::utf8_codecvt_facet));
    return {nativePath};
}

}  // namespace

bool PathExists(const std::string& nativePath) {
    return boost::filesystem::exists(boost::filesystem::status(utf8Path(nativePath)));
}

bool MakeDirectories(const std::string& nativePath, boost::system::error_code& error) {
    return boost::filesystem::create_directories(utf8Path(nativePath), error);
}

}  // namespace clipfileModule
