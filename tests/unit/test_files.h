// SPDX-License-Identifier: MIT
#pragma once

// Files and streams that a test has to itself.

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <unistd.h>

// The whole text of a file; empty when there is none.
inline std::string FileText(const std::string &path)
{
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

// A folder that goes with everything in it.
struct TEST_FOLDER {
    std::filesystem::path root;

    TEST_FOLDER()
    {
        std::string name = (std::filesystem::temp_directory_path() / "unit.XXXXXX").string();
        root = mkdtemp(name.data()) == nullptr ? "/nonexistent" : name;
    }
    TEST_FOLDER(const TEST_FOLDER &) = delete;
    TEST_FOLDER &operator=(const TEST_FOLDER &) = delete;
    ~TEST_FOLDER()
    {
        std::error_code ignored;
        std::filesystem::remove_all(root, ignored);
    }
    [[nodiscard]] std::string Path(const std::string &name) const
    {
        return (root / name).string();
    }
    // Writes a file and returns its path.
    [[nodiscard]] std::string Write(const std::string &name, const std::string &text) const
    {
        std::ofstream(Path(name), std::ios::binary) << text;
        return Path(name);
    }
};

// What fn prints on standard output.
template <typename F>
std::string StdoutOf(F fn)
{
    const TEST_FOLDER folder;
    const std::string path = folder.Write("stdout", "");
    (void)fflush(stdout);
    const int fdKept = dup(STDOUT_FILENO);
    FILE *const pFile = fopen(path.c_str(), "w");
    (void)dup2(fileno(pFile), STDOUT_FILENO);
    fn();
    (void)fflush(stdout);
    (void)dup2(fdKept, STDOUT_FILENO);
    (void)close(fdKept);
    (void)fclose(pFile);
    return FileText(path);
}
