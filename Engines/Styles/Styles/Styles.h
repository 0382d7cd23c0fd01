/// @file
/// The whole public interface of the style library, platform types included.
#pragma once

#include <Json/Json.h>
#include <SystemIO/FileSystem.h>
#include <SystemIO/Path.h>
#include <ZelPlatform/ZelString.h>
#include <ZelPref/ConversionPolicy.h>
#include <ZelUtils/Any.h>
#include <ZelUtils/Delegate.h>
#include <ZelUtils/Singleton.h>
#include <ZelUtils/Span.h>
#include <ZelUtils/Stream.h>
#include <ZelUtils/String.h>
#include <ZelUtils/StringPool.h>
#include <ZelUtils/TextStream.h>
#include <ZelUtils/Variant.h>

#include <Styles/FolderPresetManager.h>
#include <Styles/Style.h>
#include <Styles/StyleCategory.h>
#include <Styles/StyleManager.h>
#include <Styles/StylePresetManager.h>
#include <Styles/StyleProperty.h>
#include <Styles/StyleSheet.h>
#include <Styles/StyleUtilities.h>
