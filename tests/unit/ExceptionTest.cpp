// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Exceptions.h>
#include <gtest/gtest.h>
