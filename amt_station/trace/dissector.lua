-- Dissects captures that `amt-station trace export --pcapng` has made.
-- Put it where Wireshark looks for plugins, or give it to tshark with -X lua_script:FILE.

-- TABLES
local bit = bit or bit32
local HEAD = 4
local MAGIC = "aabbccdd"
local ENVELOPE, PACKET, ATOM, CHECKSUM = 12, 6, 5, 4
local LARGEST = 4096
local RESULT = 1
local TYPES = { [1] = "int", [2] = "str", [3] = "bytes", [4] = "bool" }
local STATUS = { [0] = "bad", [1] = "good" }

local amt = Proto("amtline", "Manufacturing test line")

local f = {
  direction = ProtoField.uint8("amtline.direction", "Direction", base.DEC,
                               { [0] = "station says", [1] = "station hears" }),
  channel = ProtoField.uint8("amtline.channel", "Channel", base.DEC, { [0] = "pc", [1] = "app" }),
  length = ProtoField.uint32("amtline.length", "Length", base.DEC),
  flags = ProtoField.uint32("amtline.flags", "Flags", base.HEX),
  checksum = ProtoField.uint32("amtline.checksum", "Checksum", base.HEX),
  status = ProtoField.uint8("amtline.checksum.status", "Checksum status", base.DEC, STATUS),
  acknowledgement = ProtoField.bool("amtline.acknowledgement", "Acknowledgement"),
  total = ProtoField.uint16("amtline.packet.length", "Packet length", base.DEC),
  command = ProtoField.uint8("amtline.command", "Command", base.DEC_HEX, NAMES),
  name = ProtoField.string("amtline.command.name", "Command name"),
  atom = ProtoField.bytes("amtline.atom", "Atom"),
  atom_id = ProtoField.uint8("amtline.atom.id", "Id", base.DEC),
  atom_name = ProtoField.string("amtline.atom.name", "Name"),
  atom_type = ProtoField.uint8("amtline.atom.type", "Type", base.DEC, TYPES),
  atom_length = ProtoField.uint16("amtline.atom.length", "Length", base.DEC),
  int = ProtoField.int32("amtline.atom.int", "Number", base.DEC),
  bool = ProtoField.uint8("amtline.atom.bool", "Switch", base.DEC),
  str = ProtoField.string("amtline.atom.str", "Text"),
  bytes = ProtoField.bytes("amtline.atom.bytes", "Bytes"),
  word = ProtoField.string("amtline.atom.word", "Meaning"),
  result = ProtoField.int32("amtline.result", "Result", base.DEC),
  text = ProtoField.string("amtline.text", "Text"),
  rest = ProtoField.bytes("amtline.rest", "Bytes that are neither a frame nor text"),
  request_in = ProtoField.framenum("amtline.request_in", "Request in", base.NONE, frametype.REQUEST),
  response_in = ProtoField.framenum("amtline.response_in", "Answer in", base.NONE,
                                    frametype.RESPONSE),
  time = ProtoField.double("amtline.time", "Seconds since the request"),
}
local list = {}
for _, field in pairs(f) do list[#list + 1] = field end
amt.fields = list

local e = {
  malformed = ProtoExpert.new("amtline.malformed", "Malformed", expert.group.MALFORMED,
                              expert.severity.ERROR),
  checksum = ProtoExpert.new("amtline.checksum.bad", "Bad checksum", expert.group.CHECKSUM,
                             expert.severity.ERROR),
  refused = ProtoExpert.new("amtline.refused", "Refused", expert.group.RESPONSE_CODE,
                            expert.severity.NOTE),
}
amt.experts = { e.malformed, e.checksum, e.refused }

-- What has been asked last, and per frame what belongs together.
local asked, request_of, response_of

function amt.init()
  asked, request_of, response_of = nil, {}, {}
end

local crc_table = {}
for index = 0, 255 do
  local value = index
  for _ = 1, 8 do
    local low = bit.band(value, 1)
    value = bit.rshift(value, 1)
    if low == 1 then value = bit.bxor(value, 0xEDB88320) end
  end
  crc_table[index] = value
end

local function checksum(range)
  local bytes, crc = range:bytes(), 0
  local length = bytes:len()
  for index = 0, length + 3 do
    local byte = index < length and bytes:get_index(index) or 0
    local top = bit.band(bit.rshift(crc, 24), 0xFF)
    crc = bit.bxor(bit.bor(bit.lshift(crc, 8), byte), crc_table[top])
  end
  return crc
end

local function hex(range)
  return range:bytes():tohex(true)
end

local function shown(text)
  return (text:gsub("\r", "\\r"):gsub("\n", "\\n"):gsub("\t", "\\t"):gsub("[^\32-\126]", "."))
end

local function malformed(context, tree, range, why)
  tree:add_proto_expert_info(e.malformed, why)
  context.info[#context.info + 1] = "[malformed: " .. why .. "]"
  return range
end

-- packets

-- Returns what the atom says and its whole length, or nil and why it is none.
local function atom(context, tvb, tree, names)
  if tvb(0, 1):uint() ~= 0xEE then return nil, "an atom does not begin with 0xEE" end
  if tvb:len() < ATOM then return nil, "an atom has no room for its header" end
  local id, kind, length = tvb(1, 1):uint(), tvb(2, 1):uint(), tvb(3, 2):le_uint()
  if not TYPES[kind] then return nil, "an atom has the unknown type " .. kind end
  if ATOM + length > tvb:len() then return nil, "an atom announces more bytes than are left" end
  if kind == 1 and length ~= 4 or kind == 4 and length ~= 1 then
    return nil, "an atom has the wrong length for its type"
  end
  local whole = tvb(0, ATOM + length)
  local name, words = "", {}
  if names[id] then name, words = names[id][1], names[id][2] or {} end
  local branch = tree:add(f.atom, whole)
  branch:add(f.atom_id, tvb(1, 1))
  if name ~= "" then branch:add(f.atom_name, tvb(1, 1), name) end
  branch:add(f.atom_type, tvb(2, 1))
  branch:add_le(f.atom_length, tvb(3, 2))
  local says
  if kind == 1 then
    says = tvb(ATOM, 4):le_int()
    branch:add_le(f.int, tvb(ATOM, 4))
    if id == RESULT and context.result == nil then
      context.result = says
      tree:add_le(f.result, tvb(ATOM, 4))
    end
  elseif kind == 4 then
    says = tvb(ATOM, 1):uint()
    branch:add(f.bool, tvb(ATOM, 1))
  elseif length == 0 then
    says = ""
  elseif kind == 2 then
    says = shown(tvb(ATOM, length):raw())
    branch:add(f.str, tvb(ATOM, length), says)
  else
    branch:add(f.bytes, tvb(ATOM, length))
    local raw = tvb(ATOM, length):raw()
    says = raw:find("[^\32-\126\r\n\t]") and hex(tvb(ATOM, length)) or shown(raw)
  end
  local text = (name ~= "" and name or tostring(id)) .. "=" .. says
  if words[says] then
    branch:add(f.word, tvb(ATOM, length), words[says])
    text = text .. " (" .. words[says] .. ")"
  end
  branch:set_text("Atom " .. id .. " " .. TYPES[kind] .. ": " .. text)
  return text, ATOM + length
end

local function is_answer(request, command)
  if request.text then return command == 0 end
  local own = ANSWERS[request.command] or bit.band(request.command + 1, 0xFF)
  return command == own or command == bit.band(request.command + 1, 0xFF)
end

local function relate(context, command, is_whole_answer)
  if context.pinfo.visited then return end
  local number = context.pinfo.number
  if not context.heard then
    asked = { number = number, command = command, text = command == nil,
              time = context.pinfo.rel_ts }
  elseif asked and (is_whole_answer == nil or is_answer(asked, command)
                    or not context.app and context.result == 1) then
    request_of[number] = request_of[number] or asked
    if is_whole_answer and not response_of[asked.number] then
      response_of[asked.number] = number
    end
  end
end

local function packet(context, tvb, tree)
  if tvb:len() < PACKET then
    return malformed(context, tree, tvb, "no room for a packet")
  end
  local total, command = tvb(0, 2):le_uint(), tvb(3, 1):uint()
  if tvb(2, 1):uint() ~= 0xBB then
    return malformed(context, tree, tvb, "a packet does not begin with 0xBB")
  end
  if total < PACKET or total > LARGEST or total ~= tvb:len()
    or tvb(4, 2):le_uint() ~= total - PACKET then
    return malformed(context, tree, tvb, "the packet's lengths do not fit")
  end
  tree:add_le(f.total, tvb(0, 2))
  tree:add(f.command, tvb(3, 1))
  tree:add(f.name, tvb(3, 1), NAMES[command])
  local info = { command .. " " .. NAMES[command] }
  local names
  if context.heard then
    local known = asked and not asked.text and asked.command
    local before = request_of[context.pinfo.number]
    if before and not before.text then known = before.command end
    names = known and is_answer({ command = known }, command) and ANSWER_ATOMS[known]
      or ANSWER_ATOMS[command - 1] or { [RESULT] = { "result" } }
  else
    names = REQUEST_ATOMS[command] or {}
  end
  context.result = nil
  local offset = PACKET
  while offset < total do
    local text, length = atom(context, tvb(offset, total - offset):tvb(), tree, names)
    if not text then
      malformed(context, tree, tvb, length)
      return
    end
    info[#info + 1] = text
    offset = offset + length
  end
  if context.heard and context.result and context.result ~= 0 then
    tree:add_proto_expert_info(e.refused, "refused with code " .. context.result)
  end
  context.info[#context.info + 1] = table.concat(info, " ")
  relate(context, command, true)
end

-- Returns how many bytes the frame at the beginning has; 0 when there is none.
local function frame(context, tvb, tree)
  local there = tvb:len()
  if there < 8 then return 0, "a frame has no room for its length" end
  local length = tvb(4, 4):le_uint()
  if length ~= 8 and (length < PACKET + 8 or length > LARGEST + 8) then
    return 0, "a frame cannot have the length field " .. length
  end
  local size = length + 8
  if size > there then return 0, "a frame announces more bytes than are there" end
  local branch = tree:add(amt, tvb(0, size), "Frame")
  branch:add_le(f.length, tvb(4, 4))
  branch:add_le(f.flags, tvb(8, 4))
  local stated = tvb(size - CHECKSUM, CHECKSUM)
  branch:add_le(f.checksum, stated)
  local is_good = bit.bxor(checksum(tvb(0, size - CHECKSUM)), stated:le_uint()) == 0
  branch:add(f.status, stated, is_good and 1 or 0)
  if not is_good then
    branch:add_proto_expert_info(e.checksum, "the checksum is not that of the frame's bytes")
    context.info[#context.info + 1] = "[bad checksum]"
  end
  if size == 16 then
    if hex(tvb(0, size)) == ACKNOWLEDGEMENT then
      branch:add(f.acknowledgement, tvb(0, size), true)
      context.info[#context.info + 1] = "acknowledgement"
      if context.heard then relate(context) end
    elseif is_good then
      malformed(context, branch, tvb, "a frame without a packet that acknowledges nothing")
    end
  elseif is_good then
    packet(context, tvb(ENVELOPE, size - ENVELOPE - CHECKSUM):tvb(), branch)
  end
  return size
end

-- The first bytes of a character beyond ASCII, and how many follow.
local CHARACTERS = { { "^[\194-\223]", 1 }, { "^[\224-\239]", 2 }, { "^[\240-\244]", 3 } }

local function is_text(raw)
  local place = 1
  while place <= #raw do
    local _, last = raw:find("^[\t\r\n\32-\126]+", place)
    for _, row in ipairs(last and {} or CHARACTERS) do
      local rest = raw:sub(place + 1, place + row[2])
      if raw:find(row[1], place) and rest:find("^[\128-\191]+$") and #rest == row[2] then
        last = place + row[2]
      end
    end
    if not last then return false end
    place = last + 1
  end
  return true
end

-- Text, or bytes that are nothing.
local function run(context, tvb, tree, why)
  local raw = tvb(0, tvb:len()):raw()
  if why or not is_text(raw) then
    tree:add(f.rest, tvb(0, tvb:len()))
    malformed(context, tree, tvb, why or "bytes that are neither a frame nor text")
  else
    tree:add(f.text, tvb(0, tvb:len()), shown(raw))
    context.info[#context.info + 1] = shown(raw)
    if not context.heard then
      relate(context)
    elseif asked and asked.text then
      relate(context)
      local number = context.pinfo.number
      if not context.pinfo.visited then
        response_of[asked.number] = response_of[asked.number] or number
      end
    end
  end
end

local function stream(context, tvb, tree)
  local offset, length = 0, tvb:len()
  local bytes = hex(tvb(0, length))
  while offset < length do
    local here = bytes:find(MAGIC, offset * 2 + 1, true)
    while here and here % 2 == 0 do here = bytes:find(MAGIC, here + 1, true) end
    local start = here and (here - 1) / 2 or length
    if start > offset then run(context, tvb(offset, start - offset):tvb(), tree) end
    if start == length then return end
    local size, why = frame(context, tvb(start, length - start):tvb(), tree)
    if size == 0 then
      run(context, tvb(start, length - start):tvb(), tree, why)
      return
    end
    offset = start + size
  end
end

local function links(context, tree)
  local number = context.pinfo.number
  local request, response = request_of[number], response_of[number]
  if request then
    tree:add(f.request_in, request.number):set_generated()
    tree:add(f.time, context.pinfo.rel_ts - request.time):set_generated()
  end
  if response then tree:add(f.response_in, response):set_generated() end
end

function amt.dissector(tvb, pinfo, tree)
  pinfo.cols.protocol = "AMT"
  local context = { pinfo = pinfo, info = {} }
  local top = tree:add(amt, tvb())
  if tvb:len() < HEAD or tvb(0, 1):uint() ~= HEAD_VERSION or tvb(1, 1):uint() > 1
    or tvb(2, 1):uint() > 1 then
    malformed(context, top, tvb, "no head of a trace")
  else
    context.heard, context.app = tvb(1, 1):uint() == 1, tvb(2, 1):uint() == 1
    top:add(f.direction, tvb(1, 1))
    top:add(f.channel, tvb(2, 1))
    pinfo.cols.src = context.heard and "handset" or "station"
    pinfo.cols.dst = context.heard and "station" or "handset"
    if tvb:len() > HEAD then
      local rest = tvb(HEAD, tvb:len() - HEAD):tvb()
      if not context.app then
        stream(context, rest, top)
      elseif rest:len() >= 3 and rest(2, 1):uint() == 0xBB then
        packet(context, rest, top)
      else
        run(context, rest, top, "no packet")
      end
    else
      malformed(context, top, tvb, "nothing behind the head")
    end
    links(context, top)
  end
  pinfo.cols.info = (context.heard and "<- " or "-> ") .. table.concat(context.info, " ")
end

DissectorTable.get("wtap_encap"):add(wtap.USER0, amt)
