# What the module has for systems after IEEE Std 1003.1.
target_sources(clipfile_internal PRIVATE
    platform/posix/GetPlatform.cc
    platform/posix/PosixPlatform.cc)
target_link_libraries(clipfile_internal PRIVATE ${CMAKE_DL_LIBS})
