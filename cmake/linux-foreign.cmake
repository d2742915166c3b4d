# SPDX-License-Identifier: Apache-2.0
# Another architecture on a 64-bit x86 Debian, with the libraries that `tools/foreign-libraries` has
# unpacked below build/. TSLAUTH_FOREIGN_ARCHITECTURE is its name with Debian.
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES TSLAUTH_FOREIGN_ARCHITECTURE)
set(CMAKE_SYSTEM_NAME Linux)
set(architecture ${TSLAUTH_FOREIGN_ARCHITECTURE})
get_filename_component(libraries "${CMAKE_CURRENT_LIST_DIR}/../build/${architecture}-libraries"
                       ABSOLUTE)

if(architecture STREQUAL "i386")
    # The machine runs these programs itself, with the C and C++ libraries of the
    # compiler's multilib package.
    set(CMAKE_SYSTEM_PROCESSOR i686)
    set(CMAKE_C_COMPILER gcc)
    set(CMAKE_CXX_COMPILER g++)
    set(CMAKE_C_FLAGS_INIT -m32)
    set(CMAKE_CXX_FLAGS_INIT -m32)
    set(CMAKE_LIBRARY_ARCHITECTURE i386-linux-gnu)
    include_directories(SYSTEM ${libraries}/usr/include/i386-linux-gnu ${libraries}/usr/include)
    list(APPEND CMAKE_PREFIX_PATH ${libraries}/usr)
else()
    if(architecture STREQUAL "arm64")
        set(CMAKE_SYSTEM_PROCESSOR aarch64)
    else()
        set(CMAKE_SYSTEM_PROCESSOR ${architecture})
    endif()
    set(CMAKE_LIBRARY_ARCHITECTURE ${CMAKE_SYSTEM_PROCESSOR}-linux-gnu)
    set(CMAKE_C_COMPILER ${CMAKE_LIBRARY_ARCHITECTURE}-gcc)
    set(CMAKE_CXX_COMPILER ${CMAKE_LIBRARY_ARCHITECTURE}-g++)
    set(CMAKE_SYSROOT ${libraries})
    set(CMAKE_FIND_ROOT_PATH ${libraries})
    set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
    foreach(kind LIBRARY INCLUDE PACKAGE)
        set(CMAKE_FIND_ROOT_PATH_MODE_${kind} ONLY)
    endforeach()
    set(CMAKE_CROSSCOMPILING_EMULATOR qemu-${CMAKE_SYSTEM_PROCESSOR}-static -L ${libraries})
endif()

set(OPENSSL_ROOT_DIR ${libraries}/usr)
set(OPENSSL_INCLUDE_DIR ${libraries}/usr/include)
set(OPENSSL_CRYPTO_LIBRARY ${libraries}/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/libcrypto.so)
set(OPENSSL_SSL_LIBRARY ${libraries}/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/libssl.so)
set(ENV{PKG_CONFIG_LIBDIR} ${libraries}/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/pkgconfig)
set(ENV{PKG_CONFIG_SYSROOT_DIR} ${libraries})

# What these libraries need in turn lies beside them. Unlike the newer tag, this one also serves for
# what a library needs that was found by it.
foreach(kind EXE SHARED MODULE)
    set(CMAKE_${kind}_LINKER_FLAGS_INIT "-Wl,--disable-new-dtags \
-Wl,-rpath-link,${libraries}/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}")
endforeach()
