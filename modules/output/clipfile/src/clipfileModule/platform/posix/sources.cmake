# What the module has for systems after IEEE Std 1003.1.
target_sources(clipfile_platform PRIVATE
    platform/posix/GetPlatform.cc
    platform/posix/PinLibrary.cc
    platform/posix/PosixPlatform.cc)
target_link_libraries(clipfile_platform PRIVATE ${CMAKE_DL_LIBS})
# Tests link their own in place of these: each stays an object by itself.
set_source_files_properties(platform/posix/GetPlatform.cc platform/posix/SmbShareAccess.cc
    PROPERTIES SKIP_UNITY_BUILD_INCLUSION ON)

# Network shares. libsmbclient is loaded when the first share is met; its headers are all that the build needs.
option(CLIPFILE_SMB "Record to SMB shares through libsmbclient, where its headers are installed" ON)
if(CLIPFILE_SMB)
    find_package(PkgConfig REQUIRED)
    pkg_check_modules(SMBCLIENT smbclient)
endif()
set(CLIPFILE_HAS_SHARES FALSE CACHE INTERNAL "Paths on network shares are served")
if(CLIPFILE_SMB AND SMBCLIENT_FOUND)
    set(CLIPFILE_HAS_SHARES TRUE CACHE INTERNAL "")
    target_sources(clipfile_platform PRIVATE
        platform/posix/KerberosTicket.cc
        platform/posix/SmbClient.cc
        platform/posix/SmbLibrary.cc
        platform/posix/SmbSession.cc
        platform/posix/SmbShareAccess.cc
        platform/posix/SmbStream.cc
        platform/posix/SmbThreads.cc
        platform/posix/TcpProbe.cc)
    target_include_directories(clipfile_platform SYSTEM PUBLIC ${SMBCLIENT_INCLUDE_DIRS})
else()
    message(STATUS "No network shares: libsmbclient is not installed or not wanted (CLIPFILE_SMB).")
    target_sources(clipfile_platform PRIVATE platform/posix/NoShareAccess.cc)
endif()
