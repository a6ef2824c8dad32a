-- SPDX-License-Identifier: Apache-2.0
-- Wireshark's dissector for what kestlog export writes: diag frames without their flags and
-- escapes, and chunks of the audio DSP. docs/formats.md describes both. Packets may hold
-- anything: a field is only read when all its bytes are there.

local kestdiag = Proto("kestdiag", "Co-processor diag frame")

local TYPES = {
    [0x3a] = "ring buffer",
    [0x3b] = "sleep log",
    [0x9d] = "audio DSP",
}
local REPLIES = { [0x00] = "request, or not supported", [0x01] = "end", [0x64] = "data" }
local SUB_TYPES = {
    [0x3a] = REPLIES,
    [0x3b] = REPLIES,
    [0x9d] = { [0x40] = "log", [0x42] = "dump", [0x43] = "PCM" },
}
local DUMP_END = "\nmodem_memdump_finish"

local HEADER_LEN = 8
-- What stands before the header in a chunk, and what the chunk's own length does not count.
local PREFIX_LEN = 12
local FLAGS_LEN = 4
local FLAGS = 0x7e7e7e7e
local MARK = 0x5a5a

local f = {
    seq = ProtoField.uint32("kestdiag.seq", "Sequence number"),
    length = ProtoField.uint16("kestdiag.length", "Length", base.DEC, nil, nil,
        "Of the header and the payload"),
    type = ProtoField.uint8("kestdiag.type", "Type", base.HEX, TYPES),
    sub_type = ProtoField.uint8("kestdiag.sub_type", "Sub-type", base.HEX),
    sub_name = ProtoField.string("kestdiag.sub_name", "Meaning of the sub-type"),
    payload = ProtoField.bytes("kestdiag.payload", "Payload"),
    payload_len = ProtoField.uint32("kestdiag.payload_len", "Payload length"),
    dump_end = ProtoField.bool("kestdiag.dump_end", "End of the memory dump"),
    expected = ProtoField.uint32("kestdiag.expected_seq", "Expected sequence number"),
    chunk = ProtoField.none("kestdiag.chunk", "Audio DSP chunk"),
    flags = ProtoField.uint32("kestdiag.chunk.flags", "Flags", base.HEX),
    chunk_len = ProtoField.uint16("kestdiag.chunk.length", "Length", base.DEC, nil, nil,
        "Of all but the flags"),
    reserved = ProtoField.uint16("kestdiag.chunk.reserved", "Reserved", base.HEX),
    mark = ProtoField.uint16("kestdiag.chunk.mark", "Mark", base.HEX),
    checksum = ProtoField.uint16("kestdiag.chunk.checksum", "Checksum", base.HEX),
}
kestdiag.fields = f

local e = {
    gap = ProtoExpert.new("kestdiag.gap", "Gap in the sequence", expert.group.SEQUENCE,
        expert.severity.WARN),
    bad_length = ProtoExpert.new("kestdiag.bad_length", "Wrong length", expert.group.PROTOCOL,
        expert.severity.ERROR),
    bad_checksum = ProtoExpert.new("kestdiag.bad_checksum", "Wrong checksum",
        expert.group.CHECKSUM, expert.severity.ERROR),
    short = ProtoExpert.new("kestdiag.short", "Too short for a header", expert.group.PROTOCOL,
        expert.severity.ERROR),
}
kestdiag.experts = e

kestdiag.prefs.gaps = Pref.bool("Show gaps in the sequence", true,
    "Off for a capture of one type only: the frames between are not in it.")

-- The log and each dump of a co-processor count on their own: they are queues of an interface.
local interface_id = Field.new("frame.interface_id")
local interface_queue = Field.new("frame.interface_queue")
local next_seq = {}   -- of each queue
local last_number = 0 -- of the packet that counted last
local gaps = {}       -- by packet number: the sequence number that was expected

function kestdiag.init()
    next_seq = {}
    last_number = 0
    gaps = {}
end

-- With a filter it makes Wireshark read these fields while it reads the file.
local tap = Listener.new("frame", "kestdiag")

-- Where the fields are read later only (tshark -2 without a filter), the packets count as long
-- as they come one after the other.
-- seq is nil for a packet that does not count: what is broken may have any number.
local function follow_sequence(pinfo, seq)
    local id, number = interface_id(), interface_queue()
    if not id or (pinfo.visited and pinfo.number ~= last_number + 1) then
        return
    end
    last_number = pinfo.number
    if not seq then
        return
    end
    local queue = id.value .. "/" .. (number and number.value or 0)
    local expected = next_seq[queue]
    next_seq[queue] = (seq + 1) % 0x100000000
    -- A sender that does not count always sends the same number.
    if expected and seq ~= expected and seq ~= (expected - 1) % 0x100000000 then
        gaps[pinfo.number] = expected
    end
end

-- The checksum of a chunk of that length: length and mark, folded to 16 bits and inverted.
local function checksum_of(len)
    local sum = len + MARK
    return 0xffff - (math.floor(sum / 0x10000) + sum % 0x10000) % 0x10000
end

local function dissect_prefix(buffer, tree)
    local sub = tree:add(f.chunk, buffer(0, PREFIX_LEN))
    local len = buffer(4, 2):le_uint()
    sub:add(f.flags, buffer(0, 4))
    local item = sub:add_le(f.chunk_len, buffer(4, 2))
    local right = buffer:reported_len() - FLAGS_LEN
    local good = len == right
    if not good then
        item:add_proto_expert_info(e.bad_length, string.format(
            "The chunk's length is %d where %d is right", len, right))
    end
    sub:add_le(f.reserved, buffer(6, 2))
    sub:add_le(f.mark, buffer(8, 2))
    item = sub:add_le(f.checksum, buffer(10, 2))
    if buffer(10, 2):le_uint() ~= checksum_of(len) then
        item:add_proto_expert_info(e.bad_checksum, string.format(
            "The checksum should be 0x%04x", checksum_of(len)))
        good = false
    end
    return good
end

local function is_chunk(buffer)
    return buffer:len() >= PREFIX_LEN + HEADER_LEN and buffer(0, 4):uint() == FLAGS and
        buffer(8, 2):uint() == MARK
end

function kestdiag.dissector(buffer, pinfo, root)
    local captured = buffer:len()
    local whole = buffer:reported_len()  -- a capture may hold the first bytes of packets only
    pinfo.cols.protocol = "KESTDIAG"
    local tree = root:add(kestdiag, buffer())
    if captured < HEADER_LEN then
        follow_sequence(pinfo, nil)
        tree:add_proto_expert_info(e.short)
        pinfo.cols.info = string.format("%d bytes, no header", captured)
        return captured
    end
    local start = 0
    local good = true
    if is_chunk(buffer) then
        good = dissect_prefix(buffer, tree)
        start = PREFIX_LEN
    end
    local seq = buffer(start, 4):le_uint()
    local len = buffer(start + 4, 2):le_uint()
    local kind = buffer(start + 6, 1):uint()
    local sub_kind = buffer(start + 7, 1):uint()
    local payload_len = whole - start - HEADER_LEN
    local sub_name = SUB_TYPES[kind] and SUB_TYPES[kind][sub_kind]
    local is_end = start == 0 and payload_len == #DUMP_END and captured > HEADER_LEN and
        buffer(HEADER_LEN):raw() == DUMP_END:sub(1, captured - HEADER_LEN)

    local seq_item = tree:add_le(f.seq, buffer(start, 4))
    local len_item = tree:add_le(f.length, buffer(start + 4, 2))
    tree:add(f.type, buffer(start + 6, 1))
    local sub_item = tree:add(f.sub_type, buffer(start + 7, 1))
    if sub_name then
        sub_item:append_text(" (" .. sub_name .. ")")
        tree:add(f.sub_name, buffer(start + 7, 1), sub_name):set_generated()
    end
    tree:add(f.payload_len, payload_len):set_generated()
    if captured > start + HEADER_LEN then
        tree:add(f.payload, buffer(start + HEADER_LEN))
    end

    local words = string.format("%s, %s, %d bytes", TYPES[kind] or string.format("type 0x%02x", kind),
        sub_name or string.format("sub-type 0x%02x", sub_kind), payload_len)
    if is_end then
        -- The header of this frame does not matter.
        tree:add(f.dump_end, true):set_generated()
        words = "end of the memory dump"
    elseif len ~= whole - start then
        good = false
        len_item:add_proto_expert_info(e.bad_length, string.format(
            "The header's length is %d where %d is right", len, whole - start))
        words = words .. " [wrong length]"
    end
    follow_sequence(pinfo, good and not is_end and seq or nil)
    local expected = gaps[pinfo.number]
    if expected and kestdiag.prefs.gaps then
        tree:add(f.expected, expected):set_generated()
        seq_item:add_proto_expert_info(e.gap, string.format(
            "Sequence number %d where %d was expected", seq, expected))
        words = words .. " [gap in the sequence]"
    end
    pinfo.cols.info = string.format("#%d %s", seq, words)
    return captured
end

DissectorTable.get("wtap_encap"):add(wtap.USER0, kestdiag)
