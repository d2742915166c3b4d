# SPDX-License-Identifier: Apache-2.0
# 32-bit x86 on a 64-bit Debian: the compiler of g++-multilib, and the libraries unpacked into a folder
# of the build by `tools/i386-libraries`, since both development packages cannot be installed at once.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR i686)
set(CMAKE_C_COMPILER gcc)
set(CMAKE_CXX_COMPILER g++)
set(CMAKE_C_FLAGS_INIT -m32)
set(CMAKE_CXX_FLAGS_INIT -m32)
set(CMAKE_LIBRARY_ARCHITECTURE i386-linux-gnu)

get_filename_component(i386_libraries "${CMAKE_CURRENT_LIST_DIR}/../build/i386-libraries" ABSOLUTE)
set(OPENSSL_ROOT_DIR ${i386_libraries}/usr)
set(OPENSSL_INCLUDE_DIR ${i386_libraries}/usr/include)
set(OPENSSL_CRYPTO_LIBRARY ${i386_libraries}/usr/lib/i386-linux-gnu/libcrypto.so)
set(OPENSSL_SSL_LIBRARY ${i386_libraries}/usr/lib/i386-linux-gnu/libssl.so)
include_directories(SYSTEM ${i386_libraries}/usr/include/i386-linux-gnu ${i386_libraries}/usr/include)

set(ENV{PKG_CONFIG_LIBDIR} ${i386_libraries}/usr/lib/i386-linux-gnu/pkgconfig)
set(ENV{PKG_CONFIG_SYSROOT_DIR} ${i386_libraries})

# What these libraries need in turn lies beside them. Unlike the newer tag, this one also serves for
# what a library needs that was found by it.
foreach(kind EXE SHARED MODULE)
    set(CMAKE_${kind}_LINKER_FLAGS_INIT
        "-Wl,--disable-new-dtags -Wl,-rpath-link,${i386_libraries}/usr/lib/i386-linux-gnu")
endforeach()
