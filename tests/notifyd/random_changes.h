#pragma once

#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <random>
#include <string>
#include <utility>
#include <vector>

namespace ferrox::test {

/// Random changes of a tree. Few names come again and again; fresh ones never, and so no records are joined.
class RandomChanges {
 public:
  RandomChanges(std::string root, unsigned seed, bool fresh_names)
      : root_(std::move(root)), random_(seed), fresh_names_(fresh_names) {}

  void Do() {
    const std::vector<std::filesystem::path> all = {std::filesystem::recursive_directory_iterator(root_),
                                                    std::filesystem::recursive_directory_iterator()};
    const auto any = [&] { return all.empty() ? std::filesystem::path(root_) : all[random_() % all.size()]; };
    const std::filesystem::path folder = std::filesystem::is_directory(any()) ? any() : std::filesystem::path(root_);
    const std::filesystem::path place =
        (std::filesystem::is_directory(folder) ? folder : std::filesystem::path(root_)) / NextName();
    const std::filesystem::path victim = any();
    switch (random_() % 10) {
      case 0:
      case 1:
        (void)mkdir(place.c_str(), 0755);
        return;
      case 2:
      case 3:
        (void)close(open(place.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0644));
        return;
      case 4:
        if (all.size() > 40) std::filesystem::remove_all(victim);
        return;
      case 5:
        if (!fresh_names_) (void)renameat2(AT_FDCWD, victim.c_str(), AT_FDCWD, any().c_str(), RENAME_EXCHANGE);
        return;
      default:
        if (victim != root_) (void)rename(victim.c_str(), place.c_str());
    }
  }

 private:
  std::string NextName() { return "n" + std::to_string(fresh_names_ ? next_++ : static_cast<int>(random_() % 5)); }

  std::string root_;
  std::mt19937 random_;
  bool fresh_names_;
  int next_ = 0;
};

}  // namespace ferrox::test
