/// Fills a table from a group whose every node is as a writer makes it, by the exact steps.
#pragma once

#include <cstdint>
#include <span>
#include <utility>
#include <vector>

#include "inspect/table/filling.h"
#include "tav/core/bytes.hpp"
#include "tav/core/step.hpp"
#include "tav/inspect/node.hpp"

namespace tav::inspect
{

/// Goes from node to node by the steps of tav::core, over bytes in memory. At whatever leaves a Walker a choice, it
/// gives up: an open group, a size that does not suit its type or its level, bytes of padding or of a pair that are not
/// there, strings behind which two bytes more may stand. So a group that it gets through has the nodes that a Walker
/// finds in it, and no damage.
class ExactWalk
{
public:
  explicit ExactWalk(Filling& filling)
      : filling_(filling) {}

  /// The bytes of a closed group from its header to its end. The filling has entered it. False when it gave up, at
  /// `reached()`: what was filled is to be taken back.
  bool through(std::span<const uint8_t> bytes, const Form& form, bool wide);

  /// Whether groups have been taken for plain so far: in this machine's order, without paddings and pairs. Then the
  /// same bytes are to be tried again after a failure, from which on they are not.
  bool expectMore() { return std::exchange(plain_, false); }

  /// Offset in the bytes of the node at which it gave up.
  uint64_t reached() const { return reached_; }

private:
  enum class Way : uint8_t
  {
    down,
    up,
    notHere
  };
  struct Around
  {
    core::Level level;
    core::Node group;
  };

  template<class Bytes>
  bool walk(const Bytes& bytes, const core::Node& group);
  template<bool wide, class Bytes>
  Way onLevel(const Bytes& bytes, const core::Level& level, bool first, core::Node& node);
  template<class Bytes>
  Way enter(const Bytes& bytes, const core::Node& group, const core::Level& level);

  Filling& filling_;
  std::vector<Around> around_{};
  uint64_t reached_ = 0;
  bool plain_ = true;
};

} // namespace tav::inspect
