#pragma once

#include <optional>
#include <string>

namespace droxa {

// Where one installation of the drive ("a home") keeps its files. Everything lies below one folder, so that
// several homes live side by side; every process takes it with --home.
// Thread contract: immutable.
class DroxaHome {
 public:
  // `folder`, else $DROXA_HOME, else $XDG_DATA_HOME/droxa, else ~/.local/share/droxa.
  static DroxaHome resolve(const std::optional<std::string> &folder);
  explicit DroxaHome(std::string root);

  const std::string &root() const { return root_; }
  std::string replica() const { return root_ + "/replica"; }       // one folder a container
  std::string state() const { return root_ + "/state"; }           // databases
  std::string configuration() const { return root_ + "/config"; }  // accounts, personas, feature-flags
  std::string run() const { return root_ + "/run"; }               // sockets, process identifiers
  std::string logs() const { return root_ + "/logs"; }
  std::string daemonSocket() const { return run() + "/keld.sock"; }
  std::string hostSocket() const { return run() + "/fileproviderd.sock"; }
  // Where the drive is to be mounted, for as long as it is: the text is the folder's path.
  std::string mountFile() const { return run() + "/mount"; }
  // Where the drive is mounted when nobody says otherwise: "~/Droxa Drive" for the usual home, "Droxa Drive"
  // in any other.
  std::string defaultMountPoint() const;

  // Makes the folders, each only for its owner (0700). False, with `problem` naming the folder, on failure.
  bool create(std::string *problem) const;

 private:
  std::string root_;
};

// The home of this process; set once at start-up (programs), per fixture (tests).
const DroxaHome &DroxaProcessHome();
void DroxaSetProcessHome(DroxaHome home);

}  // namespace droxa
