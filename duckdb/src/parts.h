/// The parts of files that the threads of one scan share.
#pragma once

#include <condition_variable>
#include <cstdint>
#include <exception>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "duckdb/src/given.h"
#include "tav/inspect/plan.hpp"

namespace tav::sql
{

constexpr uint64_t kLargeFile = uint64_t{16} << 20U; ///< bytes from which on several threads read one file

/// How many bytes a file has; 0 where nobody knows.
uint64_t sizeOf(const std::string& file);

/// A large file in parts. A part is read before it is known whether the one before ends where it begins; its rows count
/// when all before it do.
class PartedFile
{
public:
  PartedFile(std::string file, std::vector<inspect::Part> parts)
      : name(std::move(file)), parts_(std::move(parts)) {}

  size_t count() const { return parts_.size(); }
  inspect::Part part(size_t number);

  /// What the rows before a part were.
  struct Before
  {
    uint64_t rows = 0;
    std::vector<int64_t> around{}; ///< the rows that the groups around the part are, by level
  };

  /// Waits until all parts before this one count. Then this one does, too, and it is told what was before it; or it
  /// does not begin where the one before ended: then nothing, and it is to be read once more as `part` gives it now.
  /// Where a part has failed, throws what it failed with.
  std::optional<Before> settle(size_t number, uint64_t rows, const std::vector<int64_t>& open,
                               const inspect::PartEnd& end);
  /// A part cannot be read: those behind it do not wait for it any more, and fail with the same, as the engine tells
  /// what whichever of them comes first says. What another part has failed with before stays.
  void fail(std::exception_ptr error);

  const std::string name;

private:
  std::mutex mutex_{};
  std::condition_variable changed_{};
  std::vector<inspect::Part> parts_;
  std::vector<inspect::PartEnd> ends_{}; ///< of those that count
  Before behind_{};
  std::exception_ptr failed_{}; ///< what a part failed with
};

/// What a thread reads next: a file, or a part of one.
struct Task
{
  std::string file{};
  std::shared_ptr<PartedFile> parted{}; ///< null: the whole file
  size_t part = 0;
};

/// Hands out files, and parts of large ones, in their order.
class Tasks
{
public:
  /// Cuts a file.
  using Plan = std::function<std::vector<inspect::Part>(inspect::ByteSource&, const inspect::PlanOptions&)>;

  /// Without a plan no file is cut.
  Tasks(const Given& given, Plan plan)
      : given_(given), plan_(std::move(plan)) {}

  std::optional<Task> next();
  /// How many there are, about.
  uint64_t count() const;

private:
  static constexpr uint64_t kPart = uint64_t{4} << 20U;

  const Given& given_;
  Plan plan_;
  std::mutex mutex_{};
  size_t file_ = 0;
  std::shared_ptr<PartedFile> parted_{}; ///< of which parts are left
  size_t part_ = 0;
};

} // namespace tav::sql
