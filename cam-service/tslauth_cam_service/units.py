# SPDX-License-Identifier: Apache-2.0
"""Names of organisational units: text in, text out."""
import re


def unit_parts(text):
    """The relative names of a unit, the innermost first, from "A/B" (B inside A) or "OU=B,OU=A".

    ValueError where it is neither.
    """
    if len(text) > 1024 or any(ord(c) < 32 or ord(c) == 127 for c in text):
        raise ValueError("not a unit")
    if "=" not in text:
        names = text.strip("/").split("/")
        if not all(name.strip() for name in names):
            raise ValueError("a part of the unit's path is empty")
        return ["OU=" + re.sub(r'([,+"\\<>;#])', r"\\\1", name.strip())
                for name in reversed(names)]
    parts = [part.strip() for part in re.split(r"(?<!\\),", text)]
    if not all(re.fullmatch(r"(OU|CN|DC)\s*=.+", part, re.IGNORECASE) for part in parts):
        raise ValueError("a distinguished name is made of OU=, CN= and DC=")
    return [re.sub(r"\s*=\s*", "=", part, count=1) for part in parts]


def unit_name(text, domain):
    """The full distinguished name of a unit of `domain`. ValueError where it is none."""
    parts = unit_parts(text)
    base = ["DC=" + label for label in domain.split(".")]
    own = [part for part in parts if part.upper().startswith("DC=")]
    if own:
        if [part.upper() for part in own] != [part.upper() for part in base] \
                or parts[-len(own):] != own or len(own) == len(parts):
            raise ValueError("the unit is of another domain")
        parts = parts[:-len(own)]
    return ",".join(parts + base)
