#pragma once
// A reader of PLY files (ascii, binary little- and big-endian) with a C-style
// handle interface: open a file, read its header, walk its elements and
// properties, register a read callback per property of interest, then read.
// Values reach the callbacks one at a time as doubles while the file streams
// through a large buffer, so a file of any size is read in constant memory.
//
// Functions that report success answer 1, and 0 on failure. Every failure is
// reported through the error callback given to ply_open (the message names
// the file and what was wrong with it); without one, it is printed on
// standard error as "RPly: <message>".
//
// A list property reaches its callback once with value_index -1 and the list
// length as the value, then once per item with value_index 0, 1, ...
// A scalar property reaches it once per instance with length 1 and
// value_index 0. A callback that answers 0 stops the read, and ply_read then
// fails.
//
// ASCII values are whitespace-separated; an integer property's value must be
// written as an integer (a leading '+' is accepted). Integers are passed on
// as written, even outside the range of their declared type, so a writer's
// out-of-range value reaches the caller rather than failing the whole file.
// A float32 value is parsed as a float, so it arrives exactly as it would
// from a binary file; one beyond a float's range becomes zero or infinity.
//
// ply_read_header refuses a header that declares more data than the file
// holds, where its size is known (a regular file, or memory): for binary
// data the instances' fixed bytes and list lengths, for ASCII one character
// and one separator per value. So a caller may size its storage by an
// element's instance count once the header has been read.
//
// A caller that knows a binary element's layout may take its instances
// whole instead, a block at a time (ply_set_block_cb), and decode them
// itself without a call per value.

#include <cstddef>
#include <memory>

namespace cloudreel {

struct PlyReader;
struct PlyElement;
struct PlyProperty;
class PlyArgument;

using p_ply = PlyReader*;
using p_ply_element = PlyElement*;
using p_ply_property = PlyProperty*;
using p_ply_argument = PlyArgument*;

// The scalar types under both families of names, and PLY_LIST as the type of
// a list property. The names are kept apart so a header reads back as it was
// written.
enum e_ply_type {
  PLY_INT8,
  PLY_UINT8,
  PLY_INT16,
  PLY_UINT16,
  PLY_INT32,
  PLY_UINT32,
  PLY_FLOAT32,
  PLY_FLOAT64,
  PLY_CHAR,
  PLY_UCHAR,
  PLY_SHORT,
  PLY_USHORT,
  PLY_INT,
  PLY_UINT,
  PLY_FLOAT,
  PLY_DOUBLE,
  PLY_LIST
};

enum e_ply_storage_mode { PLY_BIG_ENDIAN, PLY_LITTLE_ENDIAN, PLY_ASCII };

using p_ply_error_cb = void (*)(p_ply ply, const char* message);
// Answers 0 to stop reading.
using p_ply_read_cb = int (*)(p_ply_argument argument);

// Opens a file for reading; answers null (after reporting why) when it cannot
// be opened. `idata` and `pdata` are the caller's, for the error callback.
p_ply ply_open(const char* name, p_ply_error_cb error_cb, long idata, void* pdata);
// Reads a PLY image held in memory, which must outlive the reader; `name`
// stands for the file in error messages.
p_ply ply_open_from_memory(const void* data, std::size_t size, const char* name,
                           p_ply_error_cb error_cb, long idata, void* pdata);
int ply_read_header(p_ply ply);
// Registers the callback for the first property of that name in the first
// element of that name, replacing an earlier registration, and answers the
// element's instance count: 0 when either is not found (or has no instances).
long ply_set_read_cb(p_ply ply, const char* element_name, const char* property_name,
                     p_ply_read_cb read_cb, void* pdata, long idata);
// Whole instances of an element whose properties are all scalars, for a
// caller that decodes records itself: `count` consecutive instances from
// instance `first_index` on, packed as the file stores them (each of the
// element's fixed size, in the file's byte order), straight from the
// reader's buffer and valid only during the call. Answers 0 to stop.
using p_ply_block_cb = int (*)(const void* data, long first_index, long count, void* pdata);
// Registers a block callback for the first element of that name in a
// binary file: its instances then reach `block_cb` in file order, as many
// at a time as the buffer holds (at least one), and the per-property
// callbacks of that element are not called. Answers the element's instance
// count; 0, registering nothing, for an ASCII file or when there is no such
// element or it has a list property.
long ply_set_block_cb(p_ply ply, const char* element_name, p_ply_block_cb block_cb, void* pdata);
// Reads all data once, calling the registered callbacks in file order.
int ply_read(p_ply ply);
// Frees the reader; null is accepted and answers 0.
int ply_close(p_ply ply);

// The header, in file order. Each "next" function answers the first item
// when `last` is null and null after the last item.
p_ply_element ply_get_next_element(p_ply ply, p_ply_element last);
int ply_get_element_info(p_ply_element element, const char** name, long* ninstances);
p_ply_property ply_get_next_property(p_ply_element element, p_ply_property last);
// For a list, `type` is PLY_LIST and the other two give the list's types;
// for a scalar, all three are its type. Any out-parameter may be null.
int ply_get_property_info(p_ply_property property, const char** name, e_ply_type* type,
                          e_ply_type* length_type, e_ply_type* value_type);
// Comment and obj_info texts follow their keyword and one space.
const char* ply_get_next_comment(p_ply ply, const char* last);
const char* ply_get_next_obj_info(p_ply ply, const char* last);
e_ply_storage_mode ply_get_storage_mode(p_ply ply);
// "ascii", "binary_little_endian" or "binary_big_endian".
const char* ply_storage_mode_name(e_ply_storage_mode mode);
// The type's name as a header writes it ("float", "uint8", "list", ...).
const char* ply_type_name(e_ply_type type);
// The bytes a value of the scalar type takes in binary data; 0 for a list.
std::size_t ply_type_size(e_ply_type type);
int ply_get_ply_user_data(p_ply ply, void** pdata, long* idata);

// Inside a read callback. Out-parameters may be null.
int ply_get_argument_element(p_ply_argument argument, p_ply_element* element, long* instance_index);
int ply_get_argument_property(p_ply_argument argument, p_ply_property* property, long* length,
                              long* value_index);
int ply_get_argument_user_data(p_ply_argument argument, void** pdata, long* idata);
double ply_get_argument_value(p_ply_argument argument);

// What a read callback is called with. Its contents are private to the
// reader and the accessors above, which are inline because a callback calls
// them for every value of a file: a call each would cost about as much as
// decoding the value.
class PlyArgument {
  friend struct PlyReader;
  friend int ply_get_argument_element(p_ply_argument, p_ply_element*, long*);
  friend int ply_get_argument_property(p_ply_argument, p_ply_property*, long*, long*);
  friend int ply_get_argument_user_data(p_ply_argument, void**, long*);
  friend double ply_get_argument_value(p_ply_argument);

  PlyElement* element_ = nullptr;
  long instanceIndex_ = 0;
  PlyProperty* property_ = nullptr;
  long length_ = 1;
  long valueIndex_ = 0;
  double value_ = 0.0;
  void* pdata_ = nullptr;
  long idata_ = 0;
};

inline int ply_get_argument_element(p_ply_argument argument, p_ply_element* element,
                                    long* instance_index) {
  if (argument == nullptr) {
    return 0;
  }
  if (element) {
    *element = argument->element_;
  }
  if (instance_index) {
    *instance_index = argument->instanceIndex_;
  }
  return 1;
}

inline int ply_get_argument_property(p_ply_argument argument, p_ply_property* property,
                                     long* length, long* value_index) {
  if (argument == nullptr) {
    return 0;
  }
  if (property) {
    *property = argument->property_;
  }
  if (length) {
    *length = argument->length_;
  }
  if (value_index) {
    *value_index = argument->valueIndex_;
  }
  return 1;
}

inline int ply_get_argument_user_data(p_ply_argument argument, void** pdata, long* idata) {
  if (argument == nullptr) {
    return 0;
  }
  if (pdata) {
    *pdata = argument->pdata_;
  }
  if (idata) {
    *idata = argument->idata_;
  }
  return 1;
}

inline double ply_get_argument_value(p_ply_argument argument) {
  return argument ? argument->value_ : 0.0;
}

// Owns an open reader and closes it when it goes.
struct PlyCloser {
  void operator()(p_ply ply) const { ply_close(ply); }
};
using PlyHandle = std::unique_ptr<PlyReader, PlyCloser>;

}  // namespace cloudreel
