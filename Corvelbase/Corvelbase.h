// Umbrella header: everything a host needs.
#pragma once

#include "Corvelbase/MarkdownCommands.h"
#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/Lines.h"
#include "Corvelbase/platform/Log.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/PropertyList.h"
#include "Corvelbase/platform/String.h"
