#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Says in a few lines how this host stands with its domain. Exit code 0: in order, 1: not."""

import sys

import tslauth


def main() -> int:
    print(f"active store: {tslauth.recorded_store()}")
    try:
        with tslauth.Directory(seconds=10) as directory:
            membership = directory.membership()
            if membership.domain is None:
                print("the host is in no domain")
                return 1
            print(f"domain: {membership.domain.dns_name}")
            trust = directory.trust_state()
    except tslauth.TimedOut as error:
        print(f"nobody answers: {error}")
        return 1
    print("trust: " + ("in order" if trust.state == 0 else f"state {trust.state}"))
    return 0 if trust.state == 0 else 1


if __name__ == "__main__":
    sys.exit(main())
