#include "kor/port.h"

#include "kor/windows.h"

namespace tav::kor
{

FileWatch::FileWatch(const std::string& path)
    : path_(path)
{
}

FileWatch::~FileWatch() = default;

void FileWatch::watchFile() {}

/// What the system says of a folder's changes comes late for a file that is kept open: looking is as soon.
void FileWatch::wait(uint32_t milliseconds)
{
  Sleep(milliseconds);
}

} // namespace tav::kor
