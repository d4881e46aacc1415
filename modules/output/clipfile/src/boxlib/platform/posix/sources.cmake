# What the box library has for systems after IEEE Std 1003.1.
target_sources(boxlib PRIVATE platform/posix/stream_file.cc)
