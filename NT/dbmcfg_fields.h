// The one table of the kxlsystm fields that the engine works on: each field's
// offset, size and form, named once. The converters copy a field as its form
// says, the range check reads and writes it in the same form and the instance
// environment writes this machine's values into it, so none of them can
// disagree on where a value lies or how wide it is. Fields whose use the
// engine knows carry that name; the others are named by their form and offset.
#pragma once

#include <cstdint>

namespace kxldbm {

// Scalars and Bytes are copied whole; a Block is copied only when its first
// byte is set; a Text is a NUL-terminated string that never runs past its field.
enum class Form : uint8_t { U16, I16, U32, I32, F32, U64, Bytes, Block, Text };

struct Field {
  uint16_t offset;
  uint16_t size;
  Form form;
};

namespace fieldform {
constexpr Field u16(uint16_t offset) {
  return {offset, 2, Form::U16};
}
constexpr Field i16(uint16_t offset) {
  return {offset, 2, Form::I16};
}
constexpr Field u32(uint16_t offset) {
  return {offset, 4, Form::U32};
}
constexpr Field i32(uint16_t offset) {
  return {offset, 4, Form::I32};
}
constexpr Field f32(uint16_t offset) {
  return {offset, 4, Form::F32};
}
constexpr Field u64(uint16_t offset) {
  return {offset, 8, Form::U64};
}
constexpr Field bytes(uint16_t offset, uint16_t size) {
  return {offset, size, Form::Bytes};
}
constexpr Field block(uint16_t offset, uint16_t size) {
  return {offset, size, Form::Block};
}
// `size` is the distance to the next field, terminator included.
constexpr Field text(uint16_t offset, uint16_t size) {
  return {offset, size, Form::Text};
}
} // namespace fieldform

// In offset order.
inline constexpr Field kU16_22 = fieldform::u16(22);
inline constexpr Field kI32_24 = fieldform::i32(24);
inline constexpr Field kI32_32 = fieldform::i32(32);
inline constexpr Field kU16_36 = fieldform::u16(36);
inline constexpr Field kSwitch38 = fieldform::i16(38); // decides what rule 3084 subtracts
inline constexpr Field kU16_44 = fieldform::u16(44);
inline constexpr Field kWorkstationFlag = fieldform::u16(46);
inline constexpr Field kU16_48 = fieldform::u16(48);
inline constexpr Field kI16_50 = fieldform::i16(50);
inline constexpr Field kNodeBlock = fieldform::block(52, 9); // not carried into a type-5 target
inline constexpr Field kU16_62 = fieldform::u16(62);
inline constexpr Field kU32_64 = fieldform::u32(64);
inline constexpr Field kU32_68 = fieldform::u32(68);
inline constexpr Field kU32_72 = fieldform::u32(72);
inline constexpr Field kMemory = fieldform::u32(76);  // memory setting of releases before 0x0C00
inline constexpr Field kMemoryB = fieldform::u32(80); // likewise
inline constexpr Field kU16_84 = fieldform::u16(84);
inline constexpr Field kSwitch86 = fieldform::i16(86); // with the mode, sets the flag at 3434
inline constexpr Field kHeap = fieldform::u32(88);
inline constexpr Field kI32_92 = fieldform::i32(92);
inline constexpr Field kU16_96 = fieldform::u16(96);
inline constexpr Field kI16_98 = fieldform::i16(98);
inline constexpr Field kBlock100 = fieldform::block(100, 15);
inline constexpr Field kBlock115 = fieldform::block(115, 65);
inline constexpr Field kBlock180 = fieldform::block(180, 216);
inline constexpr Field kBlock396 = fieldform::block(396, 26);
inline constexpr Field kBlock422 = fieldform::block(422, 36);
inline constexpr Field kName458 = fieldform::block(458, 128);  // a name, followed by its terminator
inline constexpr Field kOldName679 = fieldform::block(679, 8); // older home of the name at 458
inline constexpr Field kBlock696 = fieldform::block(696, 49);
inline constexpr Field kBlock745 = fieldform::block(745, 49);
inline constexpr Field kU16_794 = fieldform::u16(794);
inline constexpr Field kU16_796 = fieldform::u16(796);
inline constexpr Field kU16_798 = fieldform::u16(798);
inline constexpr Field kU32_800 = fieldform::u32(800);
inline constexpr Field kI32_804 = fieldform::i32(804);
inline constexpr Field kCpuMeasure = fieldform::f32(808);
inline constexpr Field kI32_812 = fieldform::i32(812);
inline constexpr Field kU16_816 = fieldform::u16(816);
inline constexpr Field kBlock818 = fieldform::block(818, 216);
inline constexpr Field kU16_1034 = fieldform::u16(1034);
inline constexpr Field kU16_1038 = fieldform::u16(1038);
inline constexpr Field kOldName1040 = fieldform::block(1040, 8); // older home of the name at 2625
inline constexpr Field kOldName1057 = fieldform::block(1057, 8); // older home of the name at 2754
inline constexpr Field kAgents = fieldform::u16(1074);
inline constexpr Field kCodeBlock = fieldform::block(1076, 20); // "0" in its first byte means unset
inline constexpr Field kBlock1096 = fieldform::block(1096, 9);
inline constexpr Field kU16_1106 = fieldform::u16(1106);
inline constexpr Field kBlock1108 = fieldform::block(1108, 5);
inline constexpr Field kI16_1126 = fieldform::i16(1126);
inline constexpr Field kText1128 = fieldform::text(1128, 802);
inline constexpr Field kMode = fieldform::u16(1930);
inline constexpr Field kI32_1932 = fieldform::i32(1932);
inline constexpr Field kI32_1936 = fieldform::i32(1936);
inline constexpr Field kU16_1940 = fieldform::u16(1940);
inline constexpr Field kU16_1942 = fieldform::u16(1942);
inline constexpr Field kI32_1944 = fieldform::i32(1944);
inline constexpr Field kHeapCopy = fieldform::u32(1948);         // the server's second copy of the heap
inline constexpr Field kWorkstation = fieldform::bytes(1968, 9); // the machine's name, terminated
inline constexpr Field kBlock1977 = fieldform::block(1977, 227);
inline constexpr Field kText2204 = fieldform::text(2204, 33);
inline constexpr Field kText2237 = fieldform::text(2237, 33);
inline constexpr Field kText2270 = fieldform::text(2270, 33);
inline constexpr Field kText2303 = fieldform::text(2303, 33);
inline constexpr Field kText2336 = fieldform::text(2336, 256);
inline constexpr Field kText2592 = fieldform::text(2592, 33);
inline constexpr Field kName2625 = fieldform::block(2625, 128);
inline constexpr Field kName2754 = fieldform::block(2754, 128);
inline constexpr Field kName2883 = fieldform::block(2883, 128);
inline constexpr Field kReserved = fieldform::u32(3080);
inline constexpr Field kFree = fieldform::i32(3084);
inline constexpr Field kShare = fieldform::i32(3088);
inline constexpr Field kPool = fieldform::u32(3092);
inline constexpr Field kPoolSize3096 = fieldform::u32(3096); // pool sizes of releases before 0x0B00
inline constexpr Field kPoolSize3100 = fieldform::i32(3100);
inline constexpr Field kPoolSize3104 = fieldform::i32(3104);
inline constexpr Field kU32_3108 = fieldform::u32(3108);
inline constexpr Field kU16_3112 = fieldform::u16(3112);
inline constexpr Field kU16_3114 = fieldform::u16(3114);
inline constexpr Field kU16_3116 = fieldform::u16(3116);
inline constexpr Field kU16_3118 = fieldform::u16(3118);
inline constexpr Field kBandwidth = fieldform::f32(3120);
inline constexpr Field kClientComponent = fieldform::i32(3124);
inline constexpr Field kJavaPath = fieldform::block(3128, 256); // carried between files of one release
inline constexpr Field kU16_3388 = fieldform::u16(3388);
inline constexpr Field kU16_3390 = fieldform::u16(3390);
inline constexpr Field kBlock3392 = fieldform::block(3392, 24);
inline constexpr Field kU16_3416 = fieldform::u16(3416);
inline constexpr Field kU64_3424 = fieldform::u64(3424);
inline constexpr Field kModeFlagB = fieldform::u16(3432); // set for mode 2
inline constexpr Field kModeFlagA = fieldform::u16(3434); // set for mode 5 or 2 with the switch at 86
inline constexpr Field kU32_3436 = fieldform::u32(3436);
inline constexpr Field kOldName3440 = fieldform::block(3440, 8); // older home of the name at 2883
inline constexpr Field kLimitOld = fieldform::i32(3456);         // home of the limit before 0x0D00
inline constexpr Field kPoolBest = fieldform::u32(3460);
inline constexpr Field kI32_3464 = fieldform::i32(3464);
inline constexpr Field kText3468 = fieldform::text(3468, 1024);
inline constexpr Field kText4492 = fieldform::text(4492, 1024);
inline constexpr Field kText5516 = fieldform::text(5516, 1024);
inline constexpr Field kText6540 = fieldform::text(6540, 15);
inline constexpr Field kText6555 = fieldform::text(6555, 256);
inline constexpr Field kText6811 = fieldform::text(6811, 256);
inline constexpr Field kText7067 = fieldform::text(7067, 1024);
inline constexpr Field kText8091 = fieldform::text(8091, 1029);
inline constexpr Field kU64_9120 = fieldform::u64(9120);
inline constexpr Field kBlock9370 = fieldform::block(9370, 216);
inline constexpr Field kLimit = fieldform::i32(10908);

} // namespace kxldbm
