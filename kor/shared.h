/// @file shared.h
/// Plain variables that several threads read and write, because the public header gives them their plain types.
/// Not every standard library has std::atomic_ref, and the compilers' own operations are what it is made of.
#pragma once

namespace tav::kor
{
template<class Value>
Value loadAcquire(const Value& variable)
{
  return __atomic_load_n(&variable, __ATOMIC_ACQUIRE);
}

template<class Value>
Value loadRelaxed(const Value& variable)
{
  return __atomic_load_n(&variable, __ATOMIC_RELAXED);
}

template<class Value>
void store(Value& variable, Value value)
{
  __atomic_store_n(&variable, value, __ATOMIC_SEQ_CST);
}
} // namespace tav::kor
