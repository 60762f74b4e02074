// Large files in parts, which several threads read.
#include <algorithm>
#include <filesystem>
#include <system_error>
#include <utility>

#include "duckdb/src/parts.h"

namespace tav::sql
{

uint64_t sizeOf(const std::string& file)
{
  std::error_code ec;
  const uint64_t size = std::filesystem::file_size(file, ec);
  return ec ? 0 : size;
}

inspect::Part PartedFile::part(size_t number)
{
  const std::lock_guard lock(mutex_);
  return parts_[number];
}

std::optional<PartedFile::Before> PartedFile::settle(size_t number, uint64_t rows, const std::vector<int64_t>& open,
                                                     const inspect::PartEnd& end)
{
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [&] { return failed_ != nullptr || ends_.size() == number; });
  if (failed_ != nullptr)
  {
    std::rethrow_exception(failed_);
  }
  ends_.push_back(end);
  if (inspect::mendParts(std::span(parts_).first(number + 1), ends_))
  {
    ends_.pop_back();
    return {};
  }
  Before before = behind_;
  behind_.rows += rows;
  behind_.around.clear();
  for (const int64_t row : open)
  {
    const bool isBefore = row < 0;
    behind_.around.push_back(isBefore ? before.around[static_cast<size_t>(-2 - row)]
                                      : static_cast<int64_t>(before.rows) + row);
  }
  changed_.notify_all();
  return before;
}

void PartedFile::fail(std::exception_ptr error)
{
  const std::lock_guard lock(mutex_);
  if (failed_ == nullptr)
  {
    failed_ = std::move(error);
  }
  changed_.notify_all();
}

uint64_t Tasks::count() const
{
  uint64_t count = 0;
  for (const std::string& file : given_.files)
  {
    const uint64_t size = !plan_ ? 0 : sizeOf(file);
    count += size < kLargeFile ? 1 : size / kPart + 1;
  }
  return count;
}

std::optional<Task> Tasks::next()
{
  const std::lock_guard lock(mutex_);
  if (parted_ == nullptr)
  {
    if (file_ == given_.files.size())
    {
      return {};
    }
    const std::string& file = given_.files[file_++];
    if (!plan_ || sizeOf(file) < kLargeFile)
    {
      return Task{.file = file};
    }
    const inspect::Document document = given_.open(file);
    parted_ = std::make_shared<PartedFile>(
        file, plan_(document.source(), {.targetBytes = kPart, .form = given_.form}));
    part_ = 0;
  }
  Task task{parted_->name, parted_, part_++};
  if (part_ == parted_->count())
  {
    parted_.reset();
  }
  return task;
}

} // namespace tav::sql
