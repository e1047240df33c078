// Configuration shared by every part of the OSL toolchain: version numbers, the namespace, and
// the OpenImageIO and Imath types the public API is written in, under the names OSL 1.12 uses.
#pragma once

#include <Imath/ImathColor.h>
#include <Imath/ImathMatrix.h>
#include <Imath/ImathVec.h>

// Imath is included above; keep OpenImageIO from pulling in another copy of it.
#ifndef OIIO_IMATH_H_INCLUDED
#define OIIO_IMATH_H_INCLUDED 1
#endif

#include <OpenImageIO/errorhandler.h>
#include <OpenImageIO/span.h>
#include <OpenImageIO/string_view.h>
#include <OpenImageIO/strutil.h>
#include <OpenImageIO/texture.h>
#include <OpenImageIO/typedesc.h>
#include <OpenImageIO/ustring.h>

#define OSL_VERSION_MAJOR 1
#define OSL_VERSION_MINOR 12
#define OSL_VERSION_PATCH 13
#define OSL_VERSION_TWEAK 0
#define OSL_VERSION 11213
#define OSL_LIBRARY_VERSION_CODE "v1_12"
#define OSL_VERSION_STRING "1.12.13"
#define OSL_MAKE_VERSION(major, minor, patch) (10000 * (major) + 100 * (minor) + (patch))

// The toolchain lives in the plain namespace OSL (not a versioned one), so that code may reopen it
// with `namespace OSL { ... }` as well as with these macros.
#define OSL_NAMESPACE OSL
#define OSL_NAMESPACE_ENTER namespace OSL {
#define OSL_NAMESPACE_EXIT }
#define OSL_NAMESPACE_BEGIN namespace OSL {
#define OSL_NAMESPACE_END }

// Export decorations of the reference's shared libraries; ours are static, so they are empty.
#ifndef OSLQUERYPUBLIC
#define OSLQUERYPUBLIC
#endif
#ifndef OSLEXECPUBLIC
#define OSLEXECPUBLIC
#endif
#ifndef OSLCOMPPUBLIC
#define OSLCOMPPUBLIC
#endif

namespace OSL {

// Shading works in single precision; Float names that choice.
using Float = float;

using Vec2 = Imath::Vec2<Float>;
using Vec3 = Imath::Vec3<Float>;
using Color3 = Imath::Color3<Float>;
using Matrix22 = Imath::Matrix22<Float>;
using Matrix33 = Imath::Matrix33<Float>;
using Matrix44 = Imath::Matrix44<Float>;

using OIIO::TextureOpt;
using OIIO::TextureSystem;

using OIIO::cspan;
using OIIO::ErrorHandler;
using OIIO::span;
using OIIO::string_view;
using OIIO::ustring;
using OIIO::ustringhash;

using OIIO::TypeColor;
using OIIO::TypeDesc;
using OIIO::TypeFloat;
using OIIO::TypeFloat2;
using OIIO::TypeFloat4;
using OIIO::TypeInt;
using OIIO::TypeMatrix;
using OIIO::TypeNormal;
using OIIO::TypePoint;
using OIIO::TypeString;
using OIIO::TypeUInt64;
using OIIO::TypeUnknown;
using OIIO::TypeVector;
using OIIO::TypeVector2;
using OIIO::TypeVector4;

} // namespace OSL
