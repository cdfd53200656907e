// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

#include <string>

namespace vyr_sandbox {

// Builds, inside an already unshared mount namespace, a root in which the backlight state
// attribute and the APEX info list are the caller's, and switches the calling process into it.
// Nothing is changed in the host's mount namespace: every mount dies with the namespace.
class PrivateRoot {
  public:
    // apex_dir: host directory holding "apex-info-list.xml"; it is bound onto /apex as a whole so
    // that the file's name resolves to whatever the directory holds at each lookup. Empty: /apex
    // is an empty directory.
    explicit PrivateRoot(std::string apex_dir) : apex_dir_(std::move(apex_dir)) {}

    // Returns an empty string on success, else a description of the step that failed.
    std::string Enter();

  private:
    std::string BindHostTopLevel(const std::string& new_root);
    std::string OverlayBacklight(const std::string& new_root);
    std::string SwitchRoot(const std::string& new_root);

    std::string apex_dir_;
};

}  // namespace vyr_sandbox
