#include "utils/path-util.h"

namespace {

std::string_view BaseName(std::string_view path) {
    const size_t slash = path.rfind('/');
    return slash == path.npos ? path : path.substr(slash + 1);
}

std::string_view Extension(std::string_view path) {
    const std::string_view name = BaseName(path);
    const size_t dot = name.rfind('.');
    return dot == name.npos || dot == 0 ? std::string_view() : name.substr(dot + 1);
}

}  // namespace

std::string PathAddTrailingSlash(std::string_view path) {
    std::string result(path);
    if (result.empty() || result.back() != '/') result += '/';
    return result;
}

std::string PathWithoutTrailingSlashes(std::string_view path) {
    while (!path.empty() && path.back() == '/') path.remove_suffix(1);
    return std::string(path);
}

std::string PathDirName(std::string_view path) {
    const size_t slash = path.rfind('/');
    if (slash == path.npos) return ".";
    return slash == 0 ? "/" : std::string(path.substr(0, slash));
}

std::string PathBaseName(std::string_view path) { return std::string(BaseName(path)); }

std::string PathExtension(std::string_view path) { return std::string(Extension(path)); }

std::string PathStem(std::string_view path) {
    const size_t extension = Extension(path).size();
    return std::string(extension == 0 ? path : path.substr(0, path.size() - extension - 1));
}
