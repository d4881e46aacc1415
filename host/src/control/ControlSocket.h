#pragma once

#include <sys/types.h>

#include <string>

namespace receiver {

/// A Unix stream socket that listens, with the rights 0660, and its name in the file system.
class ControlSocket {
 public:
    /// A name that a run which is gone has left is taken over. Throws `ReceiverError` (`kUsage`) where
    /// another one listens, where something else has the name, and where the folder takes none.
    explicit ControlSocket(const std::string& path);
    ~ControlSocket();
    ControlSocket(const ControlSocket&) = delete;
    ControlSocket& operator=(const ControlSocket&) = delete;

    int Descriptor() const { return descriptor_; }
    /// The next client, ready for use without waiting; -1 when nobody is there.
    int Accept() const;
    /// Refuses all clients that come from now on.
    void Refuse() const;
    /// Takes the name away, unless it belongs to somebody else by now. A second time does nothing.
    void Remove();

 private:
    void Listen();

    const std::string path_;
    int descriptor_ = -1;
    /// Of the name.
    dev_t device_ = 0;
    ino_t node_ = 0;
    bool removed_ = true;
};

}  // namespace receiver
