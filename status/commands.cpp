// SPDX-License-Identifier: Apache-2.0
#include "status/commands.h"

#include "device/data.h"
#include "support/paths.h"
#include "support/prefix.h"

#include <algorithm>
#include <cerrno>

static std::string
parent_of(const std::string& canonical)
{
    return canonical.substr(0, std::min(canonical.rfind('/'), canonical.size()));
}

// Root may change anything but what the kernel refuses to everyone.
static bool
refused(velm_simulation& tree, const std::string& directory)
{
    int error = tree.may_change_in(directory);
    return error == EROFS || error == EPERM;
}

// mkdir -p: each directory of the path that is missing.
static bool
make_dirs(velm_simulation& tree, const std::string& path)
{
    velm_entry made;
    made.fresh = true, made.kind = velm_entry::directory;
    for (size_t slash = 1; slash != std::string::npos;) {
        slash = path.find('/', slash + 1);
        std::string above;
        if (tree.look(path.substr(0, slash), true, &above).kind != velm_entry::absent)
            continue;
        if (refused(tree, parent_of(above)))
            return false;
        tree.put(above, made);
    }
    return true;
}

// tzlinks-update prune: the directories below tz/ that no link names or
// that a cut stage left, its new link, and a lock entry that wedges.
static bool
prune(velm_simulation& tree)
{
    std::set<std::string> named = velm_named_updates(tree);
    std::string links = tree.where(velm_path::link_directory, true),
                updates = tree.where(velm_path::updates, true);
    std::vector<std::string> gone;
    if (tree.at(links + "/.tz_latest.new").kind != velm_entry::absent)
        gone.push_back(links + "/.tz_latest.new");
    velm_entry lock = tree.at(links + "/.tzlinks-update.lock");
    if (lock.kind != velm_entry::absent && lock.kind != velm_entry::file)
        gone.push_back(links + "/.tzlinks-update.lock");
    for (const auto& [name, kind] : tree.names(updates).value_or(velm_names())) {
        if (kind == velm_entry::directory &&
            (has_prefix(name, ".stage-") || named.count(velm_path::updates + name) == 0))
            gone.push_back(updates + "/" + name);
    }
    std::set<std::string> checked; // the kernel is asked once about each directory
    for (const std::string& canonical : gone) {
        if (checked.insert(parent_of(canonical)).second && refused(tree, parent_of(canonical)))
            return false;
        tree.put(canonical, velm_entry());
    }
    return true;
}

bool
apply(velm_simulation& tree, const velm_command& command)
{
    std::string canonical;
    velm_command::verb_t verb = command.verb;
    velm_entry entry =
        tree.look(verb == velm_command::symlink_to ? command.second : command.first,
                  verb == velm_command::copy_tree || verb == velm_command::move_tree, &canonical);
    if (verb == velm_command::make_dirs)
        return make_dirs(tree, command.first);
    if (verb == velm_command::prune)
        return prune(tree);
    bool changes_first = verb != velm_command::copy_tree && verb != velm_command::write_word;
    if (entry.error != 0 || (changes_first && refused(tree, parent_of(canonical))))
        return false;
    velm_entry made;
    made.fresh = true;
    if (verb == velm_command::symlink_to) {
        if (entry.kind == velm_entry::directory) // ln puts the link inside
            canonical += command.first.substr(command.first.rfind('/'));
        made.kind = velm_entry::link, made.text = command.first;
    } else if (verb == velm_command::remove_entry && entry.kind == velm_entry::directory) {
        return false;
    } else if (verb == velm_command::copy_tree || verb == velm_command::move_tree) {
        if (tree.look(command.second).kind != velm_entry::absent)
            return true; // test -e SECOND || ...
        if (entry.kind != velm_entry::directory)
            return false;
        made = entry, made.text.clear();
        if (verb == velm_command::move_tree)
            tree.put(canonical, velm_entry());
        tree.look(command.second, false, &canonical);
    } else if (verb == velm_command::write_word) {
        tree.look(command.second, true, &canonical);
        made.kind = velm_entry::file, made.text = command.first + "\n";
    }
    if (refused(tree, parent_of(canonical)))
        return false;
    tree.put(canonical, made);
    return true;
}

// A word the shell takes as it stands, or quoted.
static std::string
quote(const std::string& word)
{
    static const char plain[] =
        "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_./+:=@%,-";
    if (!word.empty() && word.find_first_not_of(plain) == std::string::npos)
        return word;
    std::string out = "'";
    for (char c : word)
        out += c == '\'' ? std::string("'\\''") : std::string(1, c);
    return out + "'";
}

std::string
shell_text(const velm_command& c, const std::string& root)
{
    std::string first = quote(root + c.first), second = quote(root + c.second);
    switch (c.verb) {
    case velm_command::symlink_to:
        return "ln -sfn " + quote(c.first) + " " + second;
    case velm_command::remove_entry:
        return "rm -f " + first;
    case velm_command::remove_tree:
        return "rm -rf " + first;
    case velm_command::make_dirs:
        return "mkdir -p " + first;
    case velm_command::copy_tree: // once: a second cp -a would copy into the copy
        return "test -e " + second + " || cp -a " + first + " " + second;
    case velm_command::move_tree:
        return "test -e " + second + " || mv " + first + " " + second;
    case velm_command::write_word:
        return "printf '%s\\n' " + quote(c.first) + " >" + second;
    case velm_command::prune:
        return "tzlinks-update prune" + (root.empty() ? "" : " --root " + quote(root));
    }
    return "";
}
