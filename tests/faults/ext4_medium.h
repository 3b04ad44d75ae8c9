// A disk with ext4 on it in place of a folder, whose power can be cut.
//
// The disk is a file behind a loop device. What stands in that file is what the
// file system has handed to its disk, no more: what it still keeps in memory,
// unwritten pages and names whose change it has not committed, is not there. So
// a copy of that file, taken while everything is mounted and nobody is told, is
// the disk of a machine that lost its power at that moment. (Reading the loop
// device would not do: that shows the file system's memory.) The disk itself
// loses nothing that it was handed, whether it was told to flush it or not.

#ifndef KELDOAUTH_TESTS_FAULTS_EXT4_MEDIUM_H
#define KELDOAUTH_TESTS_FAULTS_EXT4_MEDIUM_H

#include <string>

namespace faults {

class Ext4Medium {
 public:
  /// Why this machine lets us have none; empty where it does.
  static std::string obstacle();

  /// Mounts an empty one over `folder`, which keeps its mode. Its file and that
  /// of its copy are `image` and `image`.cut, of 16 MiB each. Left alone, the
  /// file system commits names every five minutes instead of five seconds, so
  /// that a slow machine sees the same as a fast one.
  Ext4Medium(std::string folder, std::string image);
  ~Ext4Medium();
  Ext4Medium(const Ext4Medium&) = delete;
  Ext4Medium& operator=(const Ext4Medium&) = delete;

  /// Everything until now is on the disk.
  void settle() const;

  /// The power goes now.
  void cut() const;

  /// The machine starts again: the folder is what ext4 makes of the disk as it
  /// was at the cut. For when no file on it is open.
  void restart();

 private:
  void mountImage() const;
  void unmount() const;

  std::string folder_;
  std::string image_;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_EXT4_MEDIUM_H
