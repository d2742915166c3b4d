/* SPDX-License-Identifier: Apache-2.0 */
#include "modules/AccountFile.h"

#include <stdint.h>
#include <string.h>

typedef struct {
    char const* begin;
    char const* end;
} Piece;

/* What stands before the next `separator`, which is taken from the rest as well. */
static Piece TakeUntil(char separator, Piece* rest) {
    Piece taken = {rest->begin, rest->end};
    char const* const found = rest->begin == rest->end ? NULL
                                                       : memchr(rest->begin, separator,
                                                                (size_t)(rest->end - rest->begin));
    if (found == NULL) {
        rest->begin = rest->end;
    } else {
        taken.end = found;
        rest->begin = found + 1;
    }
    return taken;
}

static Piece TakeLine(Piece* text) {
    Piece line = TakeUntil('\n', text);
    while (line.begin != line.end && strchr(" \t\v\f\r", *line.begin) != NULL) {
        ++line.begin;
    }
    if (line.begin != line.end && *line.begin == '#') {
        line.begin = line.end;
    }
    return line;
}

static bool IsName(Piece field, char const* name) {
    size_t const length = strlen(name);
    return (size_t)(field.end - field.begin) == length && memcmp(field.begin, name, length) == 0;
}

static bool IsNumber(Piece field, id_t number) {
    uint64_t value = 0;
    if (field.begin == field.end) {
        return false;
    }
    for (; field.begin != field.end; ++field.begin) {
        if (*field.begin < '0' || *field.begin > '9' || value > UINT32_MAX) {
            return false;
        }
        value = 10 * value + (uint64_t)(*field.begin - '0');
    }
    return value == number;
}

bool AccountFileHasName(char const* text, size_t length, char const* name) {
    Piece rest = {text, text + length};
    while (rest.begin != rest.end) {
        Piece line = TakeLine(&rest);
        if (line.begin != line.end && IsName(TakeUntil(':', &line), name)) {
            return true;
        }
    }
    return false;
}

bool AccountFileHasNumber(char const* text, size_t length, id_t number) {
    Piece rest = {text, text + length};
    while (rest.begin != rest.end) {
        Piece line = TakeLine(&rest);
        (void)TakeUntil(':', &line); /* the name */
        (void)TakeUntil(':', &line); /* the password */
        if (IsNumber(TakeUntil(':', &line), number)) {
            return true;
        }
    }
    return false;
}
