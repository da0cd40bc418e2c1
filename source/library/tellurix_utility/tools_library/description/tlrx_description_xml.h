// File forms of a description: the XML header and parameter files (".sml",
// also read from "_hdr") and the older line-oriented text form ("_hdr").
//
// The CDescription members readFromFile, writeToFile, readXML and writeXML
// are defined in tlrx_description_xml.cpp; this header adds the file-name
// rules, the single-section readers and writers and the header-write hook.
#pragma once

#include <cstdint>
#include <string>

#include "tlrx_description_section.h"
#include "tlrx_description_text.h"

// Namespace of the header schema; with CTLRX_HEADER_SCHEMA_FILE it also
// makes the schema location written on a "HEADER_INFO" root.
constexpr const char *CTLRX_HEADER_NAMESPACE_URI = "http://www.tellurix.org/schemas/header";
constexpr const char *CTLRX_HEADER_SCHEMA_FILE = "TellurixHeaderSchema_version_1.0.xsd";
constexpr const char *CTLRX_XSI_NAMESPACE_URI = "http://www.w3.org/2001/XMLSchema-instance";
constexpr const char *CTLRX_XML_DECLARATION = "<?xml version=\"1.0\" ?>";
constexpr const char *CTLRX_XML_INDENT_UNIT = "   ";
// Key of the product banner in "RasterInfo.OtherInfo".
constexpr const char *CTLRX_SOFTWARE_KEY = "SOFTWARE";

// ------------------------------------------------------------- file names

// Case-insensitive suffix test.
bool fdfEndsWithNoCase(const std::string &theText, const char *theSuffix);
// Header name of data file theName: theName itself when it already ends in
// "_hdr", ".sml", "_par", "_map", ".orb" or "_orb_hdr", else theName + "_hdr".
std::string fdfHeaderFileName(const std::string &theName);
// XML form of a header name: a trailing "_hdr", then a trailing ".sml"
// removed, then ".sml" appended.
std::string fdfXmlHeaderFileName(const std::string &theHeaderName);
// Where writeToFile puts the optional text-form copy: the header name, or,
// when that is already the XML name, the XML name with "_hdr" for ".sml".
std::string fdfTextHeaderFileName(const std::string &theName);

// ----------------------------------------------------- single sections

// Reads section theSection from theFile in the list layout: a root named
// after the section's root tag with "NumberOfElements", and "SECTION"
// elements whose "NAME" begins with the section's name. False when the file
// cannot be parsed (261121 with theRaise), has no such root or section, or
// holds counts that disagree with its content.
bool fdfReadXMLSection(CDescriptionSection &theSection, const char *theFile, bool theRaise);

// ------------------------------------------------ values written on demand

// Stores theValue (line feeds made blanks, "=" made ":") under theKey in the
// string table "RasterInfo.OtherInfo" (rows of key and value): the row whose
// key begins with theKey is overwritten, otherwise a row is appended.
// Nothing happens without such a field.
void fdfStampOtherInfo(CDescription &theDescription, const char *theKey, const char *theValue);
// The product banner under "SOFTWARE".
void fdfStampSoftware(CDescription &theDescription);
// For a geocoded raster with its registration grid set, derives the
// "DEMCoordinates" box from "RegistrationCoordinates" and "RasterInfo".
// Reports whether the box was set.
bool fdfDeriveDemBox(CDescription &theDescription);

// ------------------------------------------------------ header-write hook

// Called at the end of every CDescription::writeToFile with the name the
// caller gave (raster or header name). The ENVI header unit installs its
// writer here at start-up; nullptr (the default) writes no ENVI header.
// Returns the previous writer.
using TLRXEnviHeaderWriter = void (*)(const char *theName);
TLRXEnviHeaderWriter fdfSetEnviHeaderWriter(TLRXEnviHeaderWriter theWriter);
TLRXEnviHeaderWriter fdfGetEnviHeaderWriter();
