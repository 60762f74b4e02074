/// The parameter objects of handles.
#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kDefaultRingBytes = 0xA00000;
constexpr uint64_t kDefaultAuxBytes = 0x20000;

} // namespace

TAVInitParam::TAVInitParam()
    : version(TAV_STRUCT_VERSION), pSideStorage(nullptr), options(TAV_OPT_READ), circularBufSize(kDefaultRingBytes),
      auxSize(kDefaultAuxBytes), byteOrder(0), alignMode(0)
{
  const TraceFrame frame(probe::initParam);
  frame.dump(100, trace::record(this));
}

TAVInitParam::TAVInitParam(TAVSideStorage* storage, uint64_t optionBits)
    : version(TAV_STRUCT_VERSION), pSideStorage(storage), options(optionBits), circularBufSize(kDefaultRingBytes),
      auxSize(kDefaultAuxBytes), byteOrder(0), alignMode(0)
{
  const TraceFrame frame(probe::initParam);
  frame.dump(0, "Side storage object and options", trace::record(storage), options);
  frame.dump(100, trace::record(this));
}

TAVInitParam::TAVInitParam(TAVSideStorage* storage, uint64_t optionBits, uint64_t ringBytes, uint64_t auxBytes,
                           uint8_t order, uint8_t align)
    : version(TAV_STRUCT_VERSION), pSideStorage(storage), options(optionBits), circularBufSize(ringBytes),
      auxSize(auxBytes), byteOrder(order), alignMode(align)
{
  const TraceFrame frame(probe::initParam);
  frame.dump(0, options, circularBufSize, auxSize);
  frame.dump(1, "Side storage object", byteOrder, alignMode);
  frame.dump(2, trace::record(storage));
  frame.dump(100, trace::record(this));
}

TAVInitParam::~TAVInitParam()
{
  const TraceFrame frame(probe::initParamEnd);
}

uint32_t TAVInitParam::getVersion() const
{
  const TraceFrame frame(probe::initParamVersion);
  frame.dump(100, version);
  return version;
}

TAVResetParam::TAVResetParam()
    : version(TAV_STRUCT_VERSION), options(0)
{
  const TraceFrame frame(probe::resetParam);
  frame.dump(100, trace::record(this));
}

TAVResetParam::~TAVResetParam()
{
  const TraceFrame frame(probe::resetParamEnd);
}

uint32_t TAVResetParam::getVersion() const
{
  const TraceFrame frame(probe::resetParamVersion);
  frame.dump(100, version);
  return version;
}
