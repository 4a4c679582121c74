// Where a path of the box is written: one layer in memory per overlay of the root.
#ifndef KOVA_LAB_BOX_LAYERS_H
#define KOVA_LAB_BOX_LAYERS_H

#include <filesystem>
#include <map>
#include <string>

namespace kova {

// What to do about files that the caller may not read.
enum class unreadable { fail, skip };

class upper_layers {
public:
    // Layers are made below a folder in memory; what belongs to no other layer goes to the root itself.
    upper_layers(std::filesystem::path folder, const std::filesystem::path &root);

    // Adds a layer over a directory of the host. Returns its place.
    std::filesystem::path add(const std::filesystem::path &directory);

    // Makes a directory of the host appear in its layer, with its mode and owner. Returns its place; links in the path
    // are followed as the host has them, so that sbin means usr/sbin.
    std::filesystem::path cover(const std::filesystem::path &directory, mode_t mode = 0755);

    // Copies a file or link to its place below a directory of the host, over what the layer has there.
    void copy_entry(const std::filesystem::directory_entry &from, const std::filesystem::path &directory);

    // Copies everything below one directory into the place of another one.
    void copy_tree(const std::filesystem::path &from, const std::filesystem::path &to, unreadable policy);

private:
    std::filesystem::path place(const std::filesystem::path &directory) const;

    std::filesystem::path folder_;
    std::map<std::filesystem::path, std::filesystem::path> layers_; // directory of the host -> its layer
};

} // namespace kova

#endif
