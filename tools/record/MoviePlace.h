#pragma once

#include "tools/record/MovieFile.h"

#include <ctime>
#include <string>
#include <sys/stat.h>

namespace qivo::record {

/** Where a movie belongs.
 *
 *  The folder must exist. A source's name may contain "/": the folders that the name leads through are made. ".." is
 *  refused anywhere in the path, so that no source's name can lead out of the folder. */
class MoviePlace {
  public:
    MoviePlace(const std::string& source, std::string path);

    /** Why no movie can be made there, in one line; empty if it can as far as can be told now. Leaves nothing behind.
     */
    [[nodiscard]] std::string problem() const;

    /** Makes the movie's file. What has its name is kept beside it under its own name and time. Where that fails the
     *  handle is empty and `problem` has the reason. Both survive a power cut from then on. */
    [[nodiscard]] FileHandle create(std::string& problem);
    /** Undoes that: removes the movie's file if it is still the one that was made, and gives what had its name before
     *  that name again. */
    void takeBack();

    [[nodiscard]] const std::string& path() const { return m_path; }

  private:
    [[nodiscard]] std::string reason(const std::string& what, int error) const;
    [[nodiscard]] bool makeFolders(std::string& problem) const;
    void foldersToDisk() const;
    void giveBack();
    [[nodiscard]] bool keepExisting(std::string& problem);

    std::string m_path;
    std::string m_folder; ///< the part of the path that must exist
    std::string m_kept;   ///< where what had the name before is now; empty if nothing had
    struct stat m_made {};
};

/** The name, without its folder, under which a movie is kept that was last written at `time` (shown as local time).
 *  `attempt` counts from 1; further ones differ. At most 255 bytes, cut between characters. */
[[nodiscard]] std::string keptName(const std::string& fileName, std::time_t time, int attempt);

/** Whether one of the path's parts is "..". */
[[nodiscard]] bool climbs(const std::string& path);

} // namespace qivo::record
