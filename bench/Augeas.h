// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_AUGEAS_H
#define BENCH_AUGEAS_H

#include <augeas.h>
#include <memory>
#include <stdexcept>
#include <string>

namespace bench {

/// Augeas with one lens loaded and one file, which is how it is fastest.
class Augeas {
public:
    /// @param lens such as "Pam.lns"; @param file below `root`
    Augeas(std::string const& root, std::string const& lens, std::string const& file)
        : _augeas(::aug_init(root.c_str(), nullptr, AUG_NO_MODL_AUTOLOAD | AUG_NO_LOAD),
                  ::aug_close),
          _file("/files" + file) {
        Check(_augeas ? 0 : -1);
        Check(::aug_set(_augeas.get(), "/augeas/load/One/lens", lens.c_str()));
        Check(::aug_set(_augeas.get(), "/augeas/load/One/incl", file.c_str()));
        Check(::aug_load(_augeas.get()));
    }

    void Insert(std::string const& path, std::string const& label, bool before) {
        Check(::aug_insert(_augeas.get(), (_file + path).c_str(), label.c_str(), before));
    }

    void Set(std::string const& path, std::string const& value) {
        Check(::aug_set(_augeas.get(), (_file + path).c_str(), value.c_str()));
    }

    void Save() {
        Check(::aug_save(_augeas.get()));
    }

private:
    void Check(int result) {
        if (result < 0) {
            throw std::runtime_error(_augeas ? ::aug_error_message(_augeas.get()) : "aug_init");
        }
    }

    std::unique_ptr<augeas, decltype(&::aug_close)> _augeas;
    std::string _file;
};

} // namespace bench

#endif
