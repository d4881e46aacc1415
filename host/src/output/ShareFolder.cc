#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <functional>
#include <set>
#include <system_error>
#include <utility>
#include <vector>

#include "common/ReceiverError.h"
#include "output/OutputFolder.h"
#include "platform/SharePath.h"
#include "platform/posix/SmbSession.h"

/// The module has a copy of the same code: both use libsmbclient, and these, which the program exports.
extern "C" {
__attribute__((visibility("default"), used)) clipfileModule::Mutex clipfile_smb_process_lock;
__attribute__((visibility("default"), used)) std::atomic<int> clipfile_smb_clients;
}

namespace receiver {
namespace {

using clipfileModule::SharePath;
using clipfileModule::SmbCredentials;
using clipfileModule::SmbLibrary;
using clipfileModule::SmbSession;
using clipfileModule::SmbStatus;

using Clock = std::chrono::steady_clock;

constexpr std::chrono::seconds kRestOfFailed{10};

/// The server has answered; anything else tells of the way to it.
bool IsAnswer(int error) {
    constexpr std::array<int, 13> kAnswers{0,     ENOENT, EACCES, EPERM, EEXIST, ENOTDIR,     EISDIR,
                                           EBUSY, ENOSPC, EDQUOT, EROFS, EINVAL, ENAMETOOLONG};
    return std::find(kAnswers.begin(), kAnswers.end(), error) != kAnswers.end();
}

class ShareFolder final : public OutputFolder {
 public:
    explicit ShareFolder(const OutputPlace& place)
        : place_(place), credentials_(SmbCredentials::Of(place.user, place.password)) {}

    bool Prepare() override;
    std::optional<std::uint64_t> FreeBytes() override;
    std::string Obstacle(const std::string& date, const std::string& prefix) override;
    bool Exists(const std::string& path) override;
    std::string TakeLeftover() override { return std::exchange(leftover_, {}); }
    RecordedFile ReadBackFile(const std::string& path) override;

 private:
    /// On a connection that a server has given up since, for its age or with its restart, it is tried once
    /// more on a new one. Where that gets no answer either, or the logon is refused, later ones fail at once
    /// for a while: a run that has many files to look at ends all the same, and servers count refused
    /// passwords. Returns an error number.
    int run(const std::function<int(SmbSession&)>& operation);
    int connect();
    void restFrom(int error);
    int look(const std::string& path, SmbStatus& status);
    void expectConnection();
    bool makeWhereMissing();
    int tryFile(const std::string& folder);
    void expectWritable();

    const OutputPlace place_;
    const SmbCredentials credentials_;
    std::shared_ptr<SmbSession> session_;
    /// What operations fail with until then, when they have no connection; 0 for nothing.
    int resting_ = 0;
    Clock::time_point restingUntil_{};
    /// Folders in which a file was made.
    std::set<std::string> writable_;
    std::string leftover_;
};

std::string UrlOf(const std::string& path) {
    SharePath share;
    SharePath::Parse(ModulePath(path), share);
    return share.Url();
}

int ShareFolder::connect() {
    std::string reason;
    const SmbLibrary* const library = SmbLibrary::Get(reason);
    if (library == nullptr) {
        throw ReceiverError(ExitCode::kOutput, "the output folder '" + place_.folder +
                                                   "' is on a share, and libsmbclient cannot be " +
                                                   "loaded: " + reason +
                                                   "; install it (Debian: libsmbclient0).");
    }
    SharePath share;
    SharePath::Parse(ModulePath(place_.folder), share);
    try {
        session_ = std::make_shared<SmbSession>(*library, share, credentials_);
    } catch (const std::system_error& error) {
        return error.code().value();
    }
    return session_->ConnectResult();
}

void ShareFolder::restFrom(int error) {
    session_.reset();
    resting_ = error;
    restingUntil_ = Clock::now() + kRestOfFailed;
}

int ShareFolder::run(const std::function<int(SmbSession&)>& operation) {
    int error = ENOTCONN;
    if (session_ != nullptr) {
        error = operation(*session_);
    }
    if (!IsAnswer(error)) {
        session_.reset();
        if (resting_ != 0 && Clock::now() < restingUntil_) {
            return resting_;
        }
        resting_ = 0;
        const int refused = connect();
        error = refused != 0 ? refused : operation(*session_);
        if (refused != 0 || !IsAnswer(error)) {
            restFrom(error);
        }
    }
    return error;
}

int ShareFolder::look(const std::string& path, SmbStatus& status) {
    return run([&](SmbSession& session) { return session.Look(UrlOf(path), status); });
}

void ShareFolder::expectConnection() {
    const std::string named = "the share of the output folder '" + place_.folder + "' ";
    const int error = run([](SmbSession&) { return 0; });
    switch (error) {
        case 0:
            return;
        case EACCES:
        case EPERM:
            throw ReceiverError(
                ExitCode::kOutput,
                named + (place_.user.empty() ? "refuses who has no name; --user gives one."
                                             : "refuses the user name or the password; --user and "
                                               "--password-file give others."));
        case ENOENT:
            throw ReceiverError(ExitCode::kOutput, named + "does not exist; --output names another one.");
        default:
            throw ReceiverError(ExitCode::kOutput,
                                named + "cannot be reached: " + std::strerror(error) +
                                    "; see that its server runs, and takes connections from here.");
    }
}

bool ShareFolder::makeWhereMissing() {
    const std::string named = "the output folder '" + place_.folder + "' ";
    SmbStatus status;
    int error = look(place_.folder, status);
    if (error == 0 && !status.isFolder) {
        throw ReceiverError(ExitCode::kOutput, named + "is no folder; --output names another one.");
    }
    if (error != ENOENT) {
        // Folders that may not be looked at can have room for files.
        return false;
    }
    const std::string parent = place_.folder.substr(0, place_.folder.rfind('/'));
    error = look(parent, status);
    if (error == 0) {
        error = run([&](SmbSession& session) { return session.CreateDirectories(UrlOf(place_.folder)); });
    }
    if (error != 0) {
        throw ReceiverError(ExitCode::kOutput,
                            named + "does not exist and cannot be made: " + std::strerror(error) +
                                "; make it, or name another one with --output.");
    }
    return true;
}

/// Whether rights of the server allow a file in a folder can only be tried. An error number.
int ShareFolder::tryFile(const std::string& folder) {
    const std::string name = ".receiver-" + std::to_string(getpid()) + "-" +
                             std::to_string(std::chrono::system_clock::now().time_since_epoch().count());
    const std::string probe = UrlOf(folder) + "/" + name;
    int kept = 0;
    const int error = run([&probe, &kept](SmbSession& session) {
        SMBCFILE* file = nullptr;
        int failure = session.Open(probe, file);
        if (failure == 0) {
            failure = session.Close(file);
            kept = session.Remove(probe);
        }
        return failure;
    });
    if (kept != 0 && kept != ENOENT) {
        // Recording goes on: it deletes nothing.
        leftover_ = "the file '" + folder + "/" + name +
                    "' was made to try the folder, and cannot be deleted: " + std::strerror(kept) +
                    "; delete it by hand.";
    }
    return error;
}

void ShareFolder::expectWritable() {
    if (const int error = tryFile(place_.folder)) {
        throw ReceiverError(ExitCode::kOutput, "the output folder '" + place_.folder +
                                                   "' is not writable: " + std::strerror(error) +
                                                   "; change its rights, or name another one with --output.");
    }
}

bool ShareFolder::Prepare() {
    expectConnection();
    const bool made = makeWhereMissing();
    const std::optional<std::uint64_t> free = FreeBytes();
    if (free && *free < kMinFreeBytes) {
        throw ReceiverError(ExitCode::kOutput, FullSentence(place_.folder, *free));
    }
    expectWritable();
    return made;
}

std::optional<std::uint64_t> ShareFolder::FreeBytes() {
    std::uint64_t bytes = 0;
    const int error =
        run([&](SmbSession& session) { return session.AvailableSpace(UrlOf(place_.folder), bytes); });
    return error == 0 ? std::optional<std::uint64_t>(bytes) : std::nullopt;
}

std::string ShareFolder::Obstacle(const std::string& date, const std::string& prefix) {
    // From the last folder up to the first one that is there: in it the module makes the rest, or the file.
    const std::string dated = place_.folder + "/" + date;
    for (const std::string& path : {prefix.empty() ? dated : dated + "/" + prefix, dated}) {
        SmbStatus status;
        const int error = look(path, status);
        if (error == EACCES || error == EPERM) {
            return UnusableSentence(dated, std::string("cannot be entered: ") + std::strerror(error));
        }
        if (error != 0) {
            continue;
        }
        if (!status.isFolder) {
            return UnusableSentence(path, "is no folder");
        }
        if (writable_.count(path) != 0) {
            return {};
        }
        const int refused = tryFile(path);
        if (refused == EACCES || refused == EPERM || refused == EROFS) {
            return UnusableSentence(path, std::string("cannot be written: ") + std::strerror(refused));
        }
        if (refused == 0) {
            // Asked again and again: once is enough for what others see of the file that comes and goes.
            writable_.insert(path);
        }
        return {};
    }
    return {};
}

bool ShareFolder::Exists(const std::string& path) {
    SmbStatus status;
    return look(path, status) == 0;
}

RecordedFile ShareFolder::ReadBackFile(const std::string& path) {
    SMBCFILE* file = nullptr;
    std::uint64_t bytes = 0;
    const int error =
        run([&](SmbSession& session) { return session.OpenForReading(UrlOf(path), file, bytes); });
    if (error != 0) {
        RecordedFile recorded;
        recorded.path = path;
        recorded.problem = std::strerror(error);
        return recorded;
    }
    // On this connection alone: the file is open there.
    int unread = 0;
    RecordedFile recorded =
        ReadBack(path, bytes, [this, file, &unread](std::int64_t offset, unsigned char* data, int size) {
            std::vector<char> read;
            unread = session_->Read(file, offset, static_cast<std::size_t>(size), read);
            if (unread != 0) {
                return -1;
            }
            std::copy(read.begin(), read.end(), data);
            return static_cast<int>(read.size());
        });
    session_->Close(file);
    if (!IsAnswer(unread)) {
        restFrom(unread);
    }
    return recorded;
}

}  // namespace

bool ShareThreadsLeft() {
    return clipfile_smb_clients > 0;
}

std::unique_ptr<OutputFolder> OpenShareFolder(const OutputPlace& place) {
    return std::make_unique<ShareFolder>(place);
}

}  // namespace receiver
