meta:
  id: tav
  title: tav stream, a tree of nodes with their sizes and types
  file-extension: tav
  ks-version: '0.10'
  endian:
    switch-on: big_endian
    cases:
      true: be
      false: le
doc: |
  Nodes laid end to end, each a header and a payload; a group's payload is its children. Nothing in a stream says in which
  byte order it is, how wide the header of its first node is and whether payloads are padded: these are parameters, which
  `tav info` finds out. format.md beside this file describes the format in words.
params:
  - id: big_endian
    type: bool
  - id: wide_root
    type: bool
    doc: a root has a 64-bit header
  - id: aligned
    type: bool
    doc: payloads of data elements are padded to multiples of 8
  - id: uncounted
    type: bool
    doc: UTF-8 strings are followed by two bytes that no size counts, as tavAddString leaves them
seq:
  - id: roots
    type: node(wide_root)
    repeat: eos
types:
  node:
    params:
      - id: is_wide
        type: bool
    seq:
      - id: size
        type:
          switch-on: is_wide
          cases:
            true: u8
            false: u4
        doc: of the payload; all ones of a group that was not closed
      - id: info
        type: u4
        if: is_wide
      - id: type_code
        type: u2
        enum: type_code
      - id: element
        type: u2
      - id: children
        type: group(has_wide_children)
        size: size
        if: is_group and not is_open
      - id: open_children
        type: open_group(has_wide_children)
        if: is_group and is_open
      - id: payload
        size: size
        type:
          switch-on: type_code
          cases:
            'type_code::ascii_string': ascii_string
            'type_code::uint8': uint8
            'type_code::byte': uint8
            'type_code::sint8': sint8
            'type_code::uint16': uint16
            'type_code::sint16': sint16
            'type_code::uint32': uint32
            'type_code::sint32': sint32
            'type_code::uint64': uint64
            'type_code::sint64': sint64
            'type_code::utc_timestamp': utc_timestamp
            'type_code::utf8_string': utf8_string
            'type_code::uint64_array': uint64_array
        if: not is_group
      - id: extra
        size: 2
        if: type_code == type_code::utf8_string and _root.uncounted
      - id: padding
        size: (8 - size % 8) % 8
        if: not is_group and (_root.aligned or (flags & 0x00100000) != 0)
      - id: pair
        type: eye_size
        if: not is_group and (flags & 0x00400000) != 0
    instances:
      flags:
        value: 'is_wide ? info : 0'
      is_group:
        value: type_code == type_code::group32 or type_code == type_code::group64
      has_wide_children:
        value: is_wide and type_code == type_code::group64
      is_open:
        value: 'is_wide ? size > 0xffffffffffff : size == 0xffffffff'
      is_end:
        value: element == 65000 or element == 65001
        doc: it only ends the group around it
  group:
    doc: of known size
    params:
      - id: is_wide
        type: bool
    seq:
      - id: nodes
        type: node(is_wide)
        repeat: eos
  open_group:
    doc: its children go on to an end element, or to the end of what is around it
    params:
      - id: is_wide
        type: bool
    seq:
      - id: nodes
        type: node(is_wide)
        repeat: until
        repeat-until: _.is_end or _io.eof
        if: not _io.eof
  eye_size:
    doc: the eye catcher, and how far the node begins before it
    seq:
      - id: eye
        type: u8
      - id: distance
        type: u8
  ascii_string:
    seq:
      - id: value
        type: str
        encoding: ASCII
        size-eos: true
  utf8_string:
    seq:
      - id: code_page
        type: u2
      - id: value
        type: str
        encoding: UTF-8
        size-eos: true
  uint8:
    seq:
      - id: value
        type: u1
  sint8:
    seq:
      - id: value
        type: s1
  uint16:
    seq:
      - id: value
        type: u2
  sint16:
    seq:
      - id: value
        type: s2
  uint32:
    seq:
      - id: value
        type: u4
  sint32:
    seq:
      - id: value
        type: s4
  uint64:
    seq:
      - id: value
        type: u8
  sint64:
    seq:
      - id: value
        type: s8
  uint64_array:
    seq:
      - id: value
        type: u8
        repeat: eos
  utc_timestamp:
    doc: the moment is the seconds since 1970 plus the fractions
    seq:
      - id: seconds
        type: u8
      - id: fraction_a
        type: u2
        doc: milliseconds
      - id: fraction_b
        type: u2
        doc: microseconds
      - id: further
        type: u2
      - id: offset_minutes
        type: s2
        doc: of the time zone, east of UTC
enums:
  type_code:
    1: group32
    2: group64
    50: ascii_string
    51: uint8
    52: sint8
    53: uint16
    54: sint16
    55: uint32
    56: sint32
    57: uint64
    58: sint64
    100: utc_timestamp
    101: binary
    102: utf8_string
    103: uint128
    104: sint128
    105: byte
    106: uint64_array
