// The identity of the login program: effective ids of the web server, root as the saved ones.
#pragma once

// StepDown makes the web server's user and group the real and effective ids and keeps root as the
// saved ones, which is what the library needs to read the root-only settings for a moment.
//
// There are two ways to get here, because a saved id does not survive exec: the program is
// installed set-user-id root (mode 4750, its group the web server's), or device/launcher started
// it, with root as the real identity. Throws std::runtime_error when it was installed or started in
// another way.
void StepDown();

// CheckIdentity ends the program at once if the effective ids are not those of StepDown: the
// library can leave them raised, when memory runs out while it reads a file.
void CheckIdentity();

// DropRoot gives up the saved identity too. There is no way back.
void DropRoot();

// Loaded constructs a client or a profile of the library, and checks the ids behind it, also if
// the constructor throws.
template <class T>
class Loaded {
 public:
  Loaded() try : object_() { CheckIdentity(); } catch (...) {
    CheckIdentity();
    throw;
  }

  T* operator->() { return &object_; }
  T& operator*() { return object_; }

 private:
  T object_;
};

// AsRoot makes root the effective user while it lives, for files that only root may write. The
// group stays: files belong to root and the web server's group.
class AsRoot {
 public:
  AsRoot();
  ~AsRoot();
  AsRoot(const AsRoot&) = delete;
  AsRoot& operator=(const AsRoot&) = delete;
};
