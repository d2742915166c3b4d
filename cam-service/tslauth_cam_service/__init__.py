# SPDX-License-Identifier: Apache-2.0
"""Makes machine accounts for hosts that may hold nobody's credentials.

A host shows a one-time code that an operator has issued for it, and gets the blob of an offline
join. README.md tells how to run it, and what it does and does not protect against; openapi.json
describes what hosts and operators say to it. The library's side is the CAM provider `winbind-cam`.
"""
