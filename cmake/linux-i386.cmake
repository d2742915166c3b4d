# SPDX-License-Identifier: Apache-2.0
# 32-bit x86 on a 64-bit Debian: the compiler of g++-multilib, and OpenSSL unpacked into a folder
# of the build by `tools/i386-openssl`, since both development packages cannot be installed at once.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR i686)
set(CMAKE_C_COMPILER gcc)
set(CMAKE_CXX_COMPILER g++)
set(CMAKE_C_FLAGS_INIT -m32)
set(CMAKE_CXX_FLAGS_INIT -m32)
set(CMAKE_LIBRARY_ARCHITECTURE i386-linux-gnu)

get_filename_component(openssl "${CMAKE_CURRENT_LIST_DIR}/../build/i386-openssl/usr" ABSOLUTE)
set(OPENSSL_ROOT_DIR ${openssl})
set(OPENSSL_INCLUDE_DIR ${openssl}/include)
set(OPENSSL_CRYPTO_LIBRARY ${openssl}/lib/i386-linux-gnu/libcrypto.so)
set(OPENSSL_SSL_LIBRARY ${openssl}/lib/i386-linux-gnu/libssl.so)
include_directories(SYSTEM ${openssl}/include/i386-linux-gnu ${openssl}/include)
