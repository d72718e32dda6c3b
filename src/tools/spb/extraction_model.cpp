#include "extraction_model.h"

#include "package_layout.h"
#include "paths.h"

#include <algorithm>
#include <vector>

ExtractionModel::ExtractionModel()
{
    root_.isDirectory = true;
}

/// The node `name` in `place`, made when there is none; `place` itself once the model is full.
ExtractionModel::Node* ExtractionModel::child(Node* place, std::string_view name)
{
    const auto found = place->children.find(name);
    if (found != place->children.end())
        return found->second.get();
    if (isFull())
        return place;
    ++count_;
    Node* const made =
        place->children.emplace(std::string(name), std::make_unique<Node>()).first->second.get();
    made->parent = place;
    return made;
}

/// One step down from `place`; null when that leads out of the target.
ExtractionModel::Node* ExtractionModel::enter(Node* place, std::string_view component)
{
    if (component.empty() || component == ".")
        return place;
    return component == ".." ? place->parent : child(place, component);
}

std::string_view ExtractionModel::makeDirectories(std::string_view path)
{
    auto components = componentsOf(path);
    components.pop_back();
    Node* place = &root_;
    for (const std::string_view component : components) {
        if (place->isFile)
            return "not-a-directory";
        if (component.size() > LongestComponent)
            return "name-too-long";
        place = enter(place, component);
        if (place == nullptr)
            return {};
        if (!place->isFile)
            place->isDirectory = true;
    }
    return {};
}

std::string_view ExtractionModel::writeFile(std::string_view path)
{
    auto components = componentsOf(path);
    const std::string name(components.back());
    components.pop_back();
    Node* place = &root_;
    bool missing = false;
    for (const std::string_view component : components) {
        place = enter(place, component);
        if (place == nullptr)
            return {};
        if (place->isFile)
            return "not-a-directory";
        missing = missing || !place->isDirectory;
        place->isDirectory = true;
    }
    if (name == "." || name == "..")
        return "dot-name";

    const std::string_view code = backUp(place, name);
    child(place, name)->isFile = true;
    if (name.size() > LongestComponent)
        return "name-too-long";
    return missing ? "missing-directory" : code;
}

/// Moves away what is where a file will be written.
std::string_view ExtractionModel::backUp(Node* parent, const std::string& name)
{
    const auto found = parent->children.find(name);
    if (found == parent->children.end() || (!found->second->isFile && !found->second->isDirectory))
        return {};
    Node* const place = found->second.get();
    const std::string nameOfBackup = backupName(name);
    if (nameOfBackup.size() > LongestComponent)
        return "name-too-long";

    Node* const backup = child(parent, nameOfBackup);
    backup->isFile = false;
    if (backup->isDirectory && (place->isFile || hasEntries(*backup))) {
        place->isDirectory = false;
        return "backup-blocked";
    }
    if (place->isFile) {
        backup->isFile = true;
        return "duplicate";
    }
    moveInto(*place, *backup);
    return "replaces-directory";
}

bool ExtractionModel::hasEntries(const Node& node)
{
    return std::any_of(node.children.begin(), node.children.end(), [](const auto& child) {
        return child.second->isFile || child.second->isDirectory;
    });
}

/// Recursion: at most as deep as an entry's name has components.
void ExtractionModel::moveInto(Node& from, Node& to)
{
    to.isFile = to.isFile || from.isFile;
    to.isDirectory = to.isDirectory || from.isDirectory;
    from.isFile = from.isDirectory = false;
    for (auto& [name, node] : from.children) {
        auto& place = to.children[name];
        if (place) {
            moveInto(*node, *place);
        } else {
            node->parent = &to;
            place = std::move(node);
        }
    }
    from.children.clear();
}

bool ExtractionModel::hasFile(std::string_view path) const
{
    const Node* place = &root_;
    for (const std::string_view component : componentsOf(path)) {
        const auto found = place->children.find(component);
        if (found == place->children.end())
            return false;
        place = found->second.get();
    }
    return place->isFile;
}
