#!/usr/bin/env python3
"""Writes the raster header schema from the key files of the standard header.

The key files are what the program declares headers from; the schema is what
other tools validate headers against. Generating one from the other keeps
them in step (the tools test suite compares the two declarations).

Usage: tlrx_header_schema_from_key_files.py KEY_FILE_DIR OUTPUT_XSD
"""
import os
import re
import sys

SECTIONS = [
    "EnvisatDescriptionRecord", "EnvisatFixHeader", "user_defined_section", "CartographicSystem",
    "RegistrationCoordinates", "DEMCoordinates", "AcquisitionParameters", "ChannelInfo", "Sensor",
    "orbit_information", "sar_processing", "interferometric_processing", "PolarimetricCalibrationParameters",
    "RasterInfo", "Processing", "InitialGeometry", "StateVectorData", "StateVectorCalc", "OrbitCorrection",
    "Baseline", "GCPRasterInfo",
]
NAMESPACE = "http://www.tellurix.org/schemas/header"
WORDS = {"I": "Integer", "D": "Double", "F": "Double", "S": "String"}
BUILTIN = {"Integer": "xs:long", "Double": "xs:double", "String": "xs:string"}
TYPE_CODE = re.compile(r"^(\d*)([MV]?)([DFIS])$")


def read_key_file(path, section):
    """(name, shape, word, members) per declaration of the section's block."""
    fields, inside = [], False
    with open(path, encoding="latin-1") as stream:
        for line in stream:
            line = re.split(r"[\n\r;]", line, maxsplit=1)[0]
            if not line.strip():
                continue
            if line[:2].find("[") >= 0:
                inside = re.split(r"[\t \[\]]+", line.strip(" \t[]"))[0] == section
                continue
            if not inside or "=" not in line:
                continue
            tokens = [t for t in re.split(r"[\t =(]+", line) if t]
            match = TYPE_CODE.match(tokens[1])
            if not match:
                sys.exit(f"{path}: bad type code {tokens[1]}")
            count = int(match.group(1) or 0)
            members = tokens[2:2 + count]
            if len(members) != count:
                sys.exit(f"{path}: struct {tokens[0]} names {len(members)} of {count} members")
            fields.append((tokens[0], match.group(2), WORDS[match.group(3)], members))
    return fields


def value_type(word):
    return f"""  <xs:complexType name="Value{word}">
    <xs:simpleContent>
      <xs:extension base="{BUILTIN[word]}">
        <xs:attribute name="ID" type="xs:long"/>
      </xs:extension>
    </xs:simpleContent>
  </xs:complexType>
"""


def vector_type(word):
    return f"""  <xs:complexType name="Vector{word}">
    <xs:sequence>
      <xs:element name="Vector{word}">
        <xs:complexType>
          <xs:sequence>
            <xs:element name="Value{word}" type="tlrx:Value{word}" minOccurs="0" maxOccurs="unbounded"/>
          </xs:sequence>
          <xs:attribute name="NumberOfElements" type="xs:long" use="required"/>
        </xs:complexType>
      </xs:element>
    </xs:sequence>
  </xs:complexType>
"""


def matrix_type(word):
    return f"""  <xs:complexType name="Matrix{word}">
    <xs:sequence>
      <xs:element name="Matrix{word}">
        <xs:complexType>
          <xs:sequence>
            <xs:element name="MatrixRow{word}" minOccurs="0" maxOccurs="unbounded">
              <xs:complexType>
                <xs:sequence>
                  <xs:element name="Value{word}" type="tlrx:Value{word}" minOccurs="0" maxOccurs="unbounded"/>
                </xs:sequence>
                <xs:attribute name="ID" type="xs:long"/>
              </xs:complexType>
            </xs:element>
          </xs:sequence>
          <xs:attribute name="NumberOfRows" type="xs:long" use="required"/>
          <xs:attribute name="NumberOfColumns" type="xs:long" use="required"/>
        </xs:complexType>
      </xs:element>
    </xs:sequence>
  </xs:complexType>
"""


def struct_field(pad, name, shape, word, members):
    inner = "".join(f'{pad}                <xs:element name="{m}" type="{BUILTIN[word]}"/>\n' for m in members)
    if shape == "V":
        return f"""{pad}<xs:element name="{name}" minOccurs="0">
{pad}  <xs:complexType>
{pad}    <xs:sequence>
{pad}      <xs:element name="VectorOfStructs_{name}">
{pad}        <xs:complexType>
{pad}          <xs:sequence>
{pad}            <xs:element name="VectorOfStructsValues_{name}" minOccurs="0" maxOccurs="unbounded">
{pad}              <xs:complexType>
{pad}                <xs:sequence>
{inner}{pad}                </xs:sequence>
{pad}                <xs:attribute name="ID" type="xs:long"/>
{pad}              </xs:complexType>
{pad}            </xs:element>
{pad}          </xs:sequence>
{pad}          <xs:attribute name="NumberOfElements" type="xs:long" use="required"/>
{pad}          <xs:attribute name="NumberOfFields" type="xs:long" use="required"/>
{pad}        </xs:complexType>
{pad}      </xs:element>
{pad}    </xs:sequence>
{pad}  </xs:complexType>
{pad}</xs:element>
"""
    inner = "".join(f'{pad}          <xs:element name="{m}" type="{BUILTIN[word]}"/>\n' for m in members)
    return f"""{pad}<xs:element name="{name}" minOccurs="0">
{pad}  <xs:complexType>
{pad}    <xs:sequence>
{pad}      <xs:element name="Struct_{name}">
{pad}        <xs:complexType>
{pad}          <xs:sequence>
{inner}{pad}          </xs:sequence>
{pad}          <xs:attribute name="NumberOfFields" type="xs:long" use="required"/>
{pad}        </xs:complexType>
{pad}      </xs:element>
{pad}    </xs:sequence>
{pad}  </xs:complexType>
{pad}</xs:element>
"""


def field(pad, name, shape, word, members):
    if members:
        return struct_field(pad, name, shape, word, members)
    kind = {"": BUILTIN[word], "V": f"tlrx:Vector{word}", "M": f"tlrx:Matrix{word}"}[shape]
    return f'{pad}<xs:element name="{name}" type="{kind}" minOccurs="0"/>\n'


def main():
    if len(sys.argv) != 3:
        sys.exit(__doc__)
    key_dir, output = sys.argv[1], sys.argv[2]
    pad = " " * 14
    sections = []
    for section in SECTIONS:
        fields = read_key_file(os.path.join(key_dir, section + ".key"), section)
        body = "".join(field(pad, *f) for f in fields)
        sections.append(f"""        <xs:element name="{section}" minOccurs="0">
          <xs:complexType>
            <xs:sequence>
{body}            </xs:sequence>
          </xs:complexType>
        </xs:element>
""")
    words = ["Integer", "Double", "String"]
    text = f"""<?xml version="1.0" encoding="UTF-8"?>
<!-- Raster header files: the sections and fields of the standard header.
     Written by tools/tlrx_header_schema_from_key_files.py from data/key_files. -->
<xs:schema xmlns:xs="http://www.w3.org/2001/XMLSchema"
           xmlns:tlrx="{NAMESPACE}"
           targetNamespace="{NAMESPACE}"
           elementFormDefault="qualified">
  <xs:element name="HEADER_INFO">
    <xs:complexType>
      <xs:sequence>
{"".join(sections)}      </xs:sequence>
    </xs:complexType>
  </xs:element>
{"".join(value_type(w) for w in words)}{"".join(vector_type(w) for w in words)}{"".join(matrix_type(w) for w in words)}</xs:schema>
"""
    with open(output, "w", encoding="utf-8") as stream:
        stream.write(text)


if __name__ == "__main__":
    main()
