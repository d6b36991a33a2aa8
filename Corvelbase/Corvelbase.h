// Umbrella header: everything a host needs.
#pragma once

#include "Corvelbase/AsianCharacters.h"
#include "Corvelbase/Email.h"
#include "Corvelbase/Language.h"
#include "Corvelbase/UTI.h"
#include "Corvelbase/platform/Error.h"
#include "Corvelbase/platform/Files.h"
#include "Corvelbase/platform/Geometry.h"
#include "Corvelbase/platform/Image.h"
#include "Corvelbase/platform/KeyedArchive.h"
#include "Corvelbase/platform/Log.h"
#include "Corvelbase/platform/Pasteboard.h"
#include "Corvelbase/platform/Platform.h"
#include "Corvelbase/platform/PropertyList.h"
#include "Corvelbase/platform/String.h"
#include "Corvelbase/platform/TypeRegistry.h"
