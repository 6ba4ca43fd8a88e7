// The control side of the service: start it, stop it, move its repository. For control programs;
// the daemon itself never comes here.
//
// Every operation tells its state to other programs (platform/service-status.h). Operations of
// several control programs wait for each other. Threads: one object belongs to one thread.
#pragma once

#include <string>

#include "service/service-places.h"

class ServiceCtrl {
public:
    explicit ServiceCtrl(ServicePlaces places = {});

    // Finds or makes the repository, brings it to the present version and runs the daemon. 0, also
    // when the package is not enabled, when the daemon runs already, and when no volume can be
    // used, which leaves the state WAITING. -1 (logged) leaves the state ERROR.
    [[nodiscard]] int StartService();

    // 0 when the daemon has ended, by force if need be; -1 (logged), as when none runs, or when the
    // end could not be told to everybody.
    [[nodiscard]] int StopService();

    // For a daemon that has ended by itself, in a crash or a power cut: tells what StopService()
    // would have told, the state STOPPED and the timetables taken out. 0, or -1 (logged), as when a
    // daemon runs.
    [[nodiscard]] int SettleStop();

    // Moves the repository to the volume `to` and starts the service there; an empty `from` makes a
    // new one. The same volume is a success and changes nothing; one that is not mounted or not
    // writable is refused. False (logged) leaves the state ERROR once the daemon has been stopped,
    // and a whole repository where the settings say.
    [[nodiscard]] bool MoveRepoVolume(const std::string& from, const std::string& to);

private:
    // The caller holds the lock between control programs.
    int StartLocked();
    int StopLocked();
    bool MoveLocked(const std::string& from, const std::string& to);

    int StartOn(const std::string& volume);
    int PrepareEnvironment(const std::string& volume);
    int FinishStop();
    bool StopForMove();
    [[nodiscard]] bool IsRunning() const;

    ServicePlaces m_places;
};
