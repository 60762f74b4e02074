/// @file inspect.hpp
/// Inspection: looking into streams whose form is not known and whose bytes may be damaged. Library `libtav-inspect`.
///
/// Sources are files, storages and memory; results go to sinks that the caller gives; how far long work is comes as a
/// callback. What cannot go on throws tav::inspect::Error. Nothing here prints, ends the program or keeps global state,
/// and threads are started only where their number is asked for: they end before the call does. An object belongs to
/// one thread at a time; different objects are independent of each other.
#pragma once

#include "tav/inspect/arrow.hpp"
#include "tav/inspect/attributes.hpp"
#include "tav/inspect/checker.hpp"
#include "tav/inspect/collect.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/diff.hpp"
#include "tav/inspect/document.hpp"
#include "tav/inspect/documentOptions.hpp"
#include "tav/inspect/edit.hpp"
#include "tav/inspect/fileKind.hpp"
#include "tav/inspect/find.hpp"
#include "tav/inspect/folding.hpp"
#include "tav/inspect/follow.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/index.hpp"
#include "tav/inspect/json.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/jsonWriter.hpp"
#include "tav/inspect/locate.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/nodeColumns.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/plan.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/recover.hpp"
#include "tav/inspect/rules.hpp"
#include "tav/inspect/schema.hpp"
#include "tav/inspect/scratch.hpp"
#include "tav/inspect/similar.hpp"
#include "tav/inspect/sink.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/streamWalk.hpp"
#include "tav/inspect/table.hpp"
#include "tav/inspect/textSource.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"
#include "tav/inspect/xml.hpp"
