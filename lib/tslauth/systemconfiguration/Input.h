// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_INPUT_H
#define TSLAUTH_SYSTEMCONFIGURATION_INPUT_H

#include <array>
#include <cstddef>
#include <cstring>
#include <istream>
#include <limits>
#include <string>
#include <string_view>

/// Where the readers of the system files take their words from. `TextInput` and `StreamInput` offer
/// the same operations, so that one reader serves both.
namespace SystemConfiguration {

/// White space as the classic locale has it, whatever locale the process has set: what a system
/// file means must not depend on the language of the administrator.
inline bool IsSpace(char character) {
    static constexpr auto spaces = [] {
        std::array<bool, std::numeric_limits<unsigned char>::max() + 1> table{};
        for (char const space : {' ', '\t', '\n', '\r', '\v', '\f'}) {
            table[static_cast<unsigned char>(space)] = true;
        }
        return table;
    }();
    return spaces[static_cast<unsigned char>(character)];
}

/// A text in memory. The words are parts of it and live as long as it does.
class TextInput {
public:
    explicit TextInput(std::string_view text)
        : _begin(text.data()), _at(_begin), _end(_begin + text.size()) {}

    bool Good() const {
        return true;
    }

    bool AtEnd() const {
        return _at == _end;
    }

    void SkipSpace() {
        while (_at != _end && IsSpace(*_at)) {
            ++_at;
        }
    }

    /// Whether `character` is next.
    bool Sees(char character) const {
        return _at != _end && *_at == character;
    }

    /// The next word; empty where the input ends first.
    std::string_view Word() {
        SkipSpace();
        char const* const start = _at;
        while (_at != _end && !IsSpace(*_at)) {
            ++_at;
        }
        return Between(start, _at);
    }

    /// What is left of the line, without its line feed, which is consumed.
    std::string_view Line() {
        if (_at == _end) {
            return {};
        }
        char const* const start = _at;
        auto const* feed =
            static_cast<char const*>(std::memchr(_at, '\n', static_cast<std::size_t>(_end - _at)));
        if (feed == nullptr) {
            _at = _end;
            return Between(start, _end);
        }
        _at = feed + 1;
        return Between(start, feed);
    }

    void SkipLine() {
        (void)Line(); // only the move past it is wanted
    }

    std::size_t Position() const {
        return static_cast<std::size_t>(_at - _begin);
    }

    /// @param position at most the text's length
    void MoveTo(std::size_t position) {
        _at = _begin + position;
    }

private:
    static std::string_view Between(char const* start, char const* end) {
        return {start, static_cast<std::size_t>(end - start)};
    }

    char const* _begin;
    char const* _at;
    char const* _end;
};

/// A stream. It looks no further than the reader asks, so that the stream stands behind the last
/// word taken when the reader throws. A word lives until the next word is asked for, a line until
/// the next line is.
class StreamInput {
public:
    explicit StreamInput(std::istream& in) : _in(in) {}

    bool Good() const {
        return _in.good();
    }

    bool AtEnd() const {
        return Next() == Traits::eof();
    }

    void SkipSpace() {
        while (!AtEnd() && IsSpace(Traits::to_char_type(Next()))) {
            _in.get();
        }
    }

    bool Sees(char character) const {
        return Next() == Traits::to_int_type(character);
    }

    std::string_view Word() {
        _word.clear();
        _in >> _word;
        return _word;
    }

    std::string_view Line() {
        _line.clear();
        std::getline(_in, _line);
        return _line;
    }

    void SkipLine() {
        _in.ignore(std::numeric_limits<std::streamsize>::max(), '\n');
    }

private:
    using Traits = std::istream::traits_type;

    /// Looks at the next character. A stream that has met its end is not asked again: that would
    /// put it into the fail state, and an end where a line may begin is no failure.
    Traits::int_type Next() const {
        return _in.good() ? _in.peek() : Traits::eof();
    }

    std::istream& _in;
    std::string _word;
    std::string _line;
};

} // namespace SystemConfiguration

#endif
