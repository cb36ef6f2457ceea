-- MCFTP and the datagram of progress in Wireshark and tshark.
--
--   tshark -X lua_script:tools/wireshark/mcftp.lua -r run.pcap
--
-- or copy this file into Wireshark's folder of personal Lua plugins. Frames are found by their port
-- (a preference, 7000 unless set) and, on other ports, by their look. Enciphered frames are opened
-- with the one key that every client and server has; another key can be set in the preferences, and
-- with an empty one their bodies are only marked.

local mcftp = Proto("mcftp", "Multicast File Transfer")
local status = Proto("mcftp_status", "Multicast File Transfer Progress")

local DEFAULT_KEY = "516a0f20c59eb354690227f89db64b6c01daff90b54e6304d9f297a84d663bdc"

mcftp.prefs.port = Pref.uint("UDP port", 7000, "Port of the public and of the private groups")
mcftp.prefs.key = Pref.string("Key", DEFAULT_KEY,
                              "Key in hexadecimal digits; empty: do not decipher")

local OPCODES = {
  [1] = "RRQ", [2] = "Announcement", [3] = "DATA", [4] = "ACK", [5] = "NAK", [6] = "ERROR",
  [7] = "OACK",
}
local RRQ, ANNOUNCEMENT, DATA, ACK, NAK, ERROR, OACK = 1, 2, 3, 4, 5, 6, 7
local MINIMUM = {
  [RRQ] = 52, [ANNOUNCEMENT] = 53, [DATA] = 6, [ACK] = 6, [NAK] = 6, [ERROR] = 6, [OACK] = 10,
}
local ROLES = {
  [0] = "passive", [1] = "master, answers with ACK", [2] = "master, answers with NAK",
  [3] = "none: keeps its own",
}
local ERRORS = {
  [0] = "Undefined", [1] = "File not found", [2] = "Access violation",
  [3] = "Disk full or allocation exceeded", [4] = "Illegal operation",
  [5] = "Unknown transfer ID", [6] = "File already exists", [7] = "No such user",
  [8] = "Transfer should be terminated due to option negotiation", [64] = "Overrun",
}

local f = {
  encrypted = ProtoField.bool("mcftp.encrypted", "Enciphered", 16, nil, 0x8000),
  reserved = ProtoField.uint16("mcftp.reserved", "Reserved", base.HEX, nil, 0x7000),
  duplicate = ProtoField.bool("mcftp.duplicate", "Block had been received", 16, nil, 0x0100),
  opcode = ProtoField.uint16("mcftp.opcode", "Frame", base.DEC, OPCODES, 0x00f0),
  role = ProtoField.uint16("mcftp.role", "Role of the client", base.DEC, ROLES, 0x000c),
  resend = ProtoField.bool("mcftp.resend", "Sent again", 16, nil, 0x0002),
  last_file = ProtoField.bool("mcftp.last_file", "Last file of the run", 16, nil, 0x0001),
  unused = ProtoField.uint16("mcftp.unused", "Not used", base.HEX),
  block_size = ProtoField.uint16("mcftp.block_size", "Block size in bytes", base.DEC),
  file_size = ProtoField.uint32("mcftp.file_size", "File size in bytes", base.DEC),
  blocks = ProtoField.uint32("mcftp.blocks", "Blocks", base.DEC),
  oack_wait = ProtoField.uint32("mcftp.oack_wait", "Wait for the OACK in ms", base.DEC),
  attributes = ProtoField.uint32("mcftp.attributes", "File attributes", base.HEX),
  transfer = ProtoField.uint32("mcftp.transfer", "Transfer", base.HEX),
  time_stamp = ProtoField.string("mcftp.time_stamp", "Time stamp"),
  server_port = ProtoField.uint16("mcftp.server_port", "Server's port", base.DEC),
  server_address = ProtoField.ipv4("mcftp.server_address", "Server's address"),
  step_percent = ProtoField.uint8("mcftp.step_percent", "Progress every ... percent", base.DEC),
  step_kib = ProtoField.uint16("mcftp.step_kib", "Progress every ... KiB", base.DEC),
  file_name = ProtoField.string("mcftp.file_name", "File name"),
  masks = ProtoField.string("mcftp.masks", "Masks"),
  length = ProtoField.uint16("mcftp.length", "Data bytes", base.DEC),
  block = ProtoField.uint16("mcftp.block", "Block", base.DEC),
  data = ProtoField.bytes("mcftp.data", "Data"),
  code = ProtoField.uint16("mcftp.code", "Error", base.DEC, ERRORS),
  message = ProtoField.string("mcftp.message", "Message"),
  group_port = ProtoField.uint16("mcftp.group_port", "Private group's port", base.DEC),
  group_address = ProtoField.ipv4("mcftp.group_address", "Private group's address"),
  body = ProtoField.bytes("mcftp.enciphered_body", "Enciphered body"),
  padding = ProtoField.bytes("mcftp.padding", "Padding of the cipher"),
}
mcftp.fields = f

local s = {
  percent = ProtoField.uint16("mcftp_status.percent", "Percent of the file", base.DEC),
  total = ProtoField.uint32("mcftp_status.total", "Bytes received in this run", base.DEC),
  file_size = ProtoField.uint32("mcftp_status.file_size", "File size in bytes", base.DEC),
  file_name = ProtoField.string("mcftp_status.file_name", "File name"),
}
status.fields = s

local dropped = ProtoExpert.new("mcftp.dropped", "Every receiver drops this frame",
                                expert.group.MALFORMED, expert.severity.ERROR)
mcftp.experts = { dropped }

-- Blowfish, block by block; the halves of a block are little-endian in memory. -------------------

local PI = [[
243f6a8885a308d313198a2e03707344a4093822299f31d0082efa98ec4e6c89452821e638d01377be5466cf34e90c6c
c0ac29b7c97c50dd3f84d5b5b54709179216d5d98979fb1bd1310ba698dfb5ac2ffd72dbd01adfb7b8e1afed6a267e96
ba7c9045f12c7f9924a19947b3916cf70801f2e2858efc16636920d871574e69a458fea3f4933d7e0d95748f728eb658
718bcd5882154aee7b54a41dc25a59b59c30d5392af26013c5d1b023286085f0ca417918b8db38ef8e79dcb0603a180e
6c9e0e8bb01e8a3ed71577c1bd314b2778af2fda55605c60e65525f3aa55ab945748986263e8144055ca396a2aab10b6
b4cc5c341141e8cea15486af7c72e993b3ee1411636fbc2a2ba9c55d741831f6ce5c3e169b87931eafd6ba336c24cf5c
7a325381289586773b8f48986b4bb9afc4bfe81b6628219361d809ccfb21a991487cac605dec8032ef845d5de98575b1
dc262302eb651b8823893e81d396acc50f6d6ff383f442392e0b4482a484200469c8f04a9e1f9b5e21c66842f6e96c9a
670c9c61abd388f06a51a0d2d8542f68960fa728ab5133a36eef0b6c137a3be4ba3bf0507efb2a98a1f1651d39af0176
66ca593e82430e888cee8619456f9fb47d84a5c33b8b5ebee06f75d885c12073401a449f56c16aa64ed3aa62363f7706
1bfedf72429b023d37d0d724d00a1248db0fead349f1c09b075372c980991b7b25d479d8f6e8def7e3fe501ab6794c3b
976ce0bd04c006bac1a94fb6409f60c45e5c9ec2196a246368fb6faf3e6c53b51339b2eb3b52ec6f6dfc511f9b30952c
cc814544af5ebd09bee3d004de334afd660f2807192e4bb3c0cba85745c8740fd20b5f39b9d3fbdb5579c0bd1a60320a
d6a100c6402c7279679f25fefb1fa3cc8ea5e9f8db3222f83c7516dffd616b152f501ec8ad0552ab323db5fafd238760
53317b483e00df829e5c57bbca6f8ca01a87562edf1769dbd542a8f6287effc3ac6732c68c4f5573695b27b0bbca58c8
e1ffa35db8f011a010fa3d98fd2183b84afcb56c2dd1d35b9a53e479b6f84565d28e49bc4bfb9790e1ddf2daa4cb7e33
62fb1341cee4c6e8ef20cada36774c01d07e9efe2bf11fb495dbda4dae909198eaad8e716b93d5a0d08ed1d0afc725e0
8e3c5b2f8e7594b78ff6e2fbf2122b648888b812900df01c4fad5ea0688fc31cd1cff191b3a8c1ad2f2f2218be0e1777
ea752dfe8b021fa1e5a0cc0fb56f74e818acf3d6ce89e299b4a84fe0fd13e0b77cc43b81d2ada8d9165fa26680957705
93cc7314211a1477e6ad206577b5fa86c75442f5fb9d35cfebcdaf0c7b3e89a0d6411bd3ae1e7e4900250e2d2071b35e
226800bb57b8e0af2464369bf009b91e5563911d59dfa6aa78c14389d95a537f207d5ba202e5b9c5832603766295cfa9
11c819684e734a41b3472dca7b14a94a1b5100529a532915d60f573fbc9bc6e42b60a47681e6740008ba6fb5571be91f
f296ec6b2a0dd915b6636521e7b9f9b6ff34052ec585566453b02d5da99f8fa108ba47996e85076a4b7a70e9b5b32944
db75092ec4192623ad6ea6b049a7df7d9cee60b88fedb266ecaa8c71699a17ff5664526cc2b19ee1193602a575094c29
a0591340e4183a3e3f54989a5b429d656b8fe4d699f73fd6a1d29c07efe830f54d2d38e6f0255dc14cdd20868470eb26
6382e9c6021ecc5e09686b3f3ebaefc93c9718146b6a70a1687f358452a0e286b79c5305aa5007373e07841c7fdeae5c
8e7d44ec5716f2b8b03ada37f0500c0df01c1f040200b3ffae0cf51a3cb574b225837a58dc0921bdd19113f97ca92ff6
9432477322f547013ae5e58137c2dadcc8b576349af3dda7a94461460fd0030eecc8c73ea4751e41e238cd993bea0e2f
3280bba1183eb3314e548b384f6db9086f420d03f60a04bf2cb8129024977c795679b072bcaf89afde9a771fd9930810
b38bae12dccf3f2e5512721f2e6b7124501adde69f84cd877a5847187408da17bc9f9abce94b7d8cec7aec3adb851dfa
63094366c464c3d2ef1c18473215d908dd433b3724c2ba1612a14d432a65c45150940002133ae4dd71dff89e10314e55
81ac77d65f11199b043556f1d7a3c76b3c11183b5924a509f28fe6ed97f1fbfa9ebabf2c1e153c6e86e34570eae96fb1
860e5e0a5a3e2ab3771fe71c4e3d06fa2965dcb999e71d0f803e89d65266c8252e4cc9789c10b36ac6150eba94e2ea78
a5fc3c531e0a2df4f2f74ea7361d2b3d1939260f19c279605223a708f71312b6ebadfe6eeac31f66e3bc4595a67bc883
b17f37d1018cff28c332ddefbe6c5aa56558218568ab9802eecea50fdb2f953b2aef7dad5b6e2f841521b62829076170
ecdd4775619f151013cca830eb61bd960334fe1eaa0363cfb5735c904c70a239d59e9e0bcbaade14eecc86bc60622ca7
9cab5cabb2f3846e648b1eaf19bdf0caa02369b9655abb5040685a323c2ab4b3319ee9d5c021b8f79b540b19875fa099
95f7997e623d7da8f837889a97e32d7711ed935f166812810e358829c7e61fd696dedfa17858ba9957f584a51b227263
9b83c3ff1ac24696cdb30aeb532e30548fd948e46dbc312858ebf2ef34c6ffeafe28ed61ee7c3c735d4a14d9e864b7e3
42105d14203e13e045eee2b6a3aaabeadb6c4f15facb4fd0c742f442ef6abbb5654f3b1d41cd2105d81e799e86854dc7
e44b476a3d816250cf62a1f25b8d2646fc8883a0c1c7b6a37f1524c369cb749247848a0b5692b285095bbf00ad19489d
1462b17423820e0058428d2a0c55f5ea1dadf43e233f70613372f0928d937e41d65fecf16c223bdb7cde3759cbee7460
4085f2a7ce77326ea607808419f8509ee8efd85561d99735a969a7aac50c06c25a04abfc800bcadc9e447a2ec3453484
fdd567050e1e9ec9db73dbd3105588cd675fda79e3674340c5c43465713e38d83d28f89ef16dff20153e21e78fb03d4a
e6e39f2bdb83adf7e93d5a68948140f7f64c261c94692934411520f77602d4f7bcf46b2ed4a20068d40824713320f46a
43b7d4b7500061af1e39f62e9724454614214f74bf8b88404d95fc1d96b591af70f4ddd366a02f45bfbc09ec03bd9785
7fac6dd031cb850496eb27b355fd3941da2547e6abca0a9a28507825530429f40a2c86dae9b66dfb68dc1462d7486900
680ec0a427a18dee4f3ffea2e887ad8cb58ce0067af4d6b6aace1e7cd3375fecce78a399406b2a4220fe9e35d9f385b9
ee39d7ab3b124e8b1dc9faf74b6d185626a36631eae397b23a6efa74dd5b43326841e7f7ca7820fbfb0af54ed8feb397
454056acba48952755533a3a20838d87fe6ba9b7d096954b55a867bca1159a58cca9296399e1db33a62a4a563f3125f9
5ef47e1c9029317cfdf8e80204272f7080bb155c05282ce395c11548e4c66d2248c1133fc70f86dc07f9c9ee41041f0f
404779a45d886e17325f51ebd59bc0d1f2bcc18f41113564257b7834602a9c60dff8e8a31f636c1b0e12b4c202e1329e
af664fd1cad181156b2395e0333e92e13b240b62eebeb92285b2a20ee6ba0d99de720c8c2da2f728d012784595b794fd
647d0862e7ccf5f05449a36f877d48fac39dfd27f33e8d1e0a476341992eff743a6f6eabf4f8fd37a812dc60a1ebddf8
991be14cdb6e6b0dc67b55106d672c372765d43bdcd0e804f1290dc7cc00ffa3b5390f92690fed0b667b9ffbcedb7d9c
a091cf0bd9155ea3bb132f88515bad247b9479bf763bd6eb37392eb3cc1159798026e297f42e312d6842ada7c66a2b3b
12754ccc782ef11c6a124237b79251e706a1bbe64bfb63501a6b101811caedfa3d25bdd8e2e1c3c9444216590a121386
d90cec6ed5abea2a64af674eda86a85fbebfe98864e4c3fe9dbc8057f0f7c08660787bf86003604dd1fd8346f6381fb0
7745ae04d736fccc83426b33f01eab71b08041873c005e5f77a057bebde8ae2455464299bf582e614e58f48ff2ddfda2
f474ef388789bdc25366f9c3c8b38e74b475f25546fcd9b97aeb26618b1ddf84846a0e79915f95e2466e598e20b45770
8cd55591c902de4cb90bace1bb8205d011a862487574a99eb77f19b6e0a9dc09662d09a1c4324633e85a1f0209f0be8c
4a99a0251d6efe101ab93d1d0ba5a4dfa186f20f2868f169dcb7da83573906fea1e2ce9b4fcd7f5250115e01a70683fa
a002b5c40de6d0279af88c27773f8641c3604c0661a806b5f0177a28c0f586e0006058aa30dc7d6211e69ed72338ea63
53c2dd94c2c21634bbcbee5690bcb6deebfc7da1ce591d766f05e4094b7c018839720a3d7c927c2486e3725f724d9db9
1ac15bb4d39eb8fced54557808fca5b5d83d7cd34dad0fc41e50ef5eb161e6f8a28514d96c51133c6fd5c7e756e14ec4
362abfceddc6c837d79a323492638212670efa8e406000e03a39ce37d3faf5cfabc277375ac52d1b5cb0679e4fa33742
d382274099bc9bbed5118e9dbf0f7315d62d1c7ec700c47bb78c1b6b21a19045b26eb1be6a366eb45748ab2fbc946e79
c6a376d26549c2c8530ff8ee468dde7dd5730a1d4cd04dc62939bbdba9ba4650ac9526e8be5ee304a1fad5f06a2d519a
63ef8ce29a86ee22c089c2b843242ef6a51e03aa9cf2d0a483c061ba9be96a4d8fe51550ba645bd62826a2f9a73a3ae1
4ba99586ef5562e9c72fefd3f752f7da3f046f6977fa0a5980e4a91587b086019b09e6ad3b3ee593e990fd5a9e34d797
2cf0b7d9022b8b5196d5ac3a017da67dd1cf3ed67c7d2d281f9f25cfadf2b89b5ad6b4725a88f54ce029ac71e019a5e6
47b0acfded93fa9be8d3c48d283b57ccf8d5662979132e28785f0191ed756055f7960e44e3d35e8c15056dd488f46dba
03a161250564f0bdc3eb9e153c9057a297271aeca93a072a1b3f6d9b1e6321f5f59c66fb26dcf3197533d928b155fdf5
035634828aba3cbb28517711c20ad9f8abcc5167ccad925f4de817513830dc8e379d58629320f991ea7a90c2fb3e7bce
5121ce64774fbe32a8b6e37ec3293d4648de53696413e680a2ae0810dd6db22469852dfd09072166b39a460a6445c0dd
586cdecf1c20c8ae5bbef7dd1b588d40ccd2017f6bb4e3bbdda26a7e3a59ff453e350a44bcb4cdd572eacea8fa6484bb
8d6612aebf3c6f47d29be463542f5d9eaec2771bf64e6370740e0d8de75b1357f8721671af537d5d4040cb084eb4e2cc
34d2466a0115af84e1b0042895983a1d06b89fb4ce6ea0486f3f3b823520ab82011a1d4b277227f8611560b1e7933fdc
bb3a792b344525bda08839e151ce794b2f32c9b7a01fbac9e01cc87ebcc7d1f6cf0111c3a1e8aac71a908749d44fbd9a
d0dadecbd50ada380339c32ac69136678df9317ce0b12b4ff79e59b743f5bb3af2d519ff27d9459cbf97222c15e6fc2a
0f91fc719b941525fae59361ceb69cebc2a8645912baa8d1b6c1075ee3056a0c10d25065cb03a442e0ec6e0e1698db3b
4c98a0be3278e9649f1f9532e0d392dfd3a0342b8971f21e1b0a74414ba3348cc5be7120c37632d8df359f8d9b992f2e
e60b6f470fe3f11de54cda541edad891ce6279cfcd3e7e6f1618b166fd2c1d05848fd2c5f6fb2299f523f357a6327623
93a8353156cccd02acf081625a75ebb56e16369788d273ccde96629281b949d04c50901b71c65614e6c6c7bd327a140a
45e1d006c3f27b9ac9aa53fd62a80f00bb25bfe235bdd2f671126905b2040222b6cbcf7ccd769c2b53113ec01640e3d3
38abbd602547adf0ba38209cf746ce7677afa1c52075606085cbfe4e8ae88dd87aaaf9b04cf9aa7e1948c25c02fb8a8c
01c36ae4d6ebe1f990d4f869a65cdea03f09252dc208e69fb74e6132ce77e25b578fdfe33ac372e6
]]

local function add(a, b)
  return bit.tobit(a + b)
end

local function mix(boxes, x)
  local a = boxes[0][bit.rshift(x, 24)]
  local b = boxes[1][bit.band(bit.rshift(x, 16), 255)]
  local c = boxes[2][bit.band(bit.rshift(x, 8), 255)]
  local d = boxes[3][bit.band(x, 255)]
  return add(bit.bxor(add(a, b), c), d)
end

-- Takes two halves through the rounds with the subkeys from..to.
local function rounds(cipher, left, right, from, to, step)
  local subkeys = cipher.subkeys
  for i = from, to - 2 * step, step do
    left = bit.bxor(left, subkeys[i])
    right = bit.bxor(right, mix(cipher.boxes, left))
    left, right = right, left
  end
  return bit.bxor(right, subkeys[to]), bit.bxor(left, subkeys[to - step])
end

local function make_cipher(key)
  local words = {}
  for word in string.gmatch((string.gsub(PI, "%s", "")), "........") do
    words[#words + 1] = bit.tobit(tonumber(word, 16))
  end
  local cipher = { subkeys = {}, boxes = { [0] = {}, {}, {}, {} } }
  local at = 0
  for i = 0, 17 do
    local word = 0
    for _ = 1, 4 do
      word = bit.bor(bit.lshift(word, 8), key:get_index(at))
      at = (at + 1) % key:len()
    end
    cipher.subkeys[i] = bit.bxor(words[i + 1], word)
  end
  for box = 0, 3 do
    for i = 0, 255 do cipher.boxes[box][i] = words[19 + box * 256 + i] end
  end
  local left, right = 0, 0
  local function fill(list, last)
    for i = 0, last, 2 do
      left, right = rounds(cipher, left, right, 0, 17, 1)
      list[i], list[i + 1] = left, right
    end
  end
  fill(cipher.subkeys, 17)
  for box = 0, 3 do fill(cipher.boxes[box], 255) end
  return cipher
end

local ciphers = {}

-- The cipher of the key in the preferences, or nil.
local function cipher_in_force()
  local digits = string.gsub(mcftp.prefs.key, "[^%x]", "")
  if #digits < 2 or #digits % 2 ~= 0 then return nil end
  if ciphers[digits] == nil then ciphers[digits] = make_cipher(ByteArray.new(digits)) end
  return ciphers[digits]
end

-- A frame with its body in the clear, as a buffer of its own.
local function decipher(cipher, frame)
  local bytes = frame(0, 2):bytes()
  local body = frame(2):bytes()
  for at = 2, frame:len() - 1, 8 do
    local left = bit.tobit(frame(at, 4):le_uint())
    local right = bit.tobit(frame(at + 4, 4):le_uint())
    left, right = rounds(cipher, left, right, 17, 0, -1)
    for i = 0, 3 do
      body:set_index(at - 2 + i, bit.band(bit.rshift(left, 8 * i), 255))
      body:set_index(at + 2 + i, bit.band(bit.rshift(right, 8 * i), 255))
    end
  end
  bytes:append(body)
  return bytes:tvb("Deciphered frame")
end

-- Frames -----------------------------------------------------------------------------------------

-- Bytes of the text at `at` with its zero, or nil when none ends it.
local function text_length(frame, at)
  for i = at, frame:len() - 1 do
    if frame(i, 1):uint() == 0 then return i - at + 1 end
  end
  return nil
end

local function up_to_zero(range)
  return string.match(range:raw(), "^[^\0]*")
end

local function add_text(tree, field, frame, at)
  local length = text_length(frame, at)
  if length == nil then return nil end
  local text = up_to_zero(frame(at, length))
  tree:add(field, frame(at, length), text)
  return text, at + length
end

local function add_padding(tree, frame, at)
  if at < frame:len() then tree:add(f.padding, frame(at)) end
end

local function blocks_of(file_size, block_size)
  return math.floor((file_size + block_size - 1) / block_size)
end

-- Each returns what the list of packets shows, or nil for a frame that is dropped.
local show = {}

show[ANNOUNCEMENT] = function(frame, tree)
  tree:add(f.unused, frame(2, 2))
  tree:add(f.block_size, frame(4, 2))
  tree:add(f.file_size, frame(6, 4))
  tree:add(f.oack_wait, frame(10, 4))
  tree:add(f.attributes, frame(14, 4))
  tree:add(f.transfer, frame(18, 4))
  tree:add(f.time_stamp, frame(22, 20), up_to_zero(frame(22, 20)))
  tree:add(f.server_port, frame(42, 2))
  tree:add(f.server_address, frame(44, 4))
  tree:add(f.step_percent, frame(48, 1))
  tree:add(f.step_kib, frame(49, 2))
  local name, behind = add_text(tree, f.file_name, frame, 51)
  if name == nil or #name < 1 or #name > 259 then return nil end
  local masks
  masks, behind = add_text(tree, f.masks, frame, behind)
  if masks == nil then return nil end
  add_padding(tree, frame, behind)
  local block_size = frame(4, 2):uint()
  if block_size == 0 then return nil end
  local blocks = blocks_of(frame(6, 4):uint(), block_size)
  tree:add(f.blocks, frame(4, 6), blocks):set_generated()
  if blocks > 65535 then return nil end
  return string.format("%s, %u bytes, %u blocks", name, frame(6, 4):uint(), blocks)
end

show[RRQ] = function(frame, tree)
  tree:add(f.transfer, frame(18, 4))
  local name, behind = add_text(tree, f.file_name, frame, 51)
  if name == nil or #name < 1 or #name > 259 then return nil end
  add_padding(tree, frame, behind)
  return name
end

show[DATA] = function(frame, tree)
  local length = frame(2, 2):uint()
  tree:add(f.length, frame(2, 2))
  tree:add(f.block, frame(4, 2))
  if length > frame:len() - 6 then return nil end
  if length > 0 then tree:add(f.data, frame(6, length)) end
  add_padding(tree, frame, 6 + length)
  return string.format("block %u, %u bytes", frame(4, 2):uint(), length)
end

local function show_answer(frame, tree)
  tree:add(f.unused, frame(2, 2))
  tree:add(f.block, frame(4, 2))
  add_padding(tree, frame, 6)
  return string.format("block %u", frame(4, 2):uint())
end

show[ACK] = function(frame, tree)
  local text = show_answer(frame, tree)
  if bit.band(frame(0, 1):uint(), 1) ~= 0 then text = text .. ", again" end
  return text
end

show[NAK] = show_answer

show[ERROR] = function(frame, tree)
  tree:add(f.unused, frame(2, 2))
  tree:add(f.code, frame(4, 2))
  local length = text_length(frame, 6) or frame:len() - 6
  local message = ""
  if length > 0 then
    message = up_to_zero(frame(6, length))
    tree:add(f.message, frame(6, length), message)
  end
  add_padding(tree, frame, 6 + length)
  return string.format("%u %s", frame(4, 2):uint(), message)
end

show[OACK] = function(frame, tree)
  tree:add(f.unused, frame(2, 2))
  tree:add(f.group_port, frame(4, 2))
  tree:add(f.group_address, frame(6, 4))
  add_padding(tree, frame, 10)
  local role = bit.band(bit.rshift(frame(1, 1):uint(), 2), 3)
  local group = tostring(frame(6, 4):ipv4())
  return string.format("%s:%u, %s", group, frame(4, 2):uint(), ROLES[role])
end

local function add_header(frame, tree, opcode)
  local word = frame(0, 2)
  tree:add(f.encrypted, word)
  tree:add(f.reserved, word)
  tree:add(f.opcode, word)
  if opcode == ACK then tree:add(f.duplicate, word) end
  if opcode == OACK then tree:add(f.role, word) end
  if opcode == ANNOUNCEMENT or opcode == RRQ then tree:add(f.last_file, word) end
  tree:add(f.resend, word)
end

-- The frame whose fields are to be shown: itself, or its deciphered copy. nil: its body is closed.
local function opened(frame, encrypted)
  if not encrypted then return frame end
  local cipher = cipher_in_force()
  if cipher == nil or (frame:len() - 2) % 8 ~= 0 or frame:len() == 2 then return nil end
  return decipher(cipher, frame)
end

function mcftp.dissector(buffer, pinfo, root)
  local frame = buffer:range():tvb()
  pinfo.cols.protocol = "MCFTP"
  local tree = root:add(mcftp, buffer())
  local function drop(why)
    tree:add_proto_expert_info(dropped, why)
    pinfo.cols.info = "Dropped: " .. why
    return buffer:len()
  end
  if frame:len() < 2 then return drop("shorter than its header") end
  local high, low = frame(0, 1):uint(), frame(1, 1):uint()
  local opcode = bit.rshift(low, 4)
  local encrypted = bit.band(high, 0x80) ~= 0
  add_header(frame, tree, opcode)
  if bit.band(high, 0x70) ~= 0 then return drop("reserved bits are set") end
  local title = OPCODES[opcode] or "Unknown frame " .. opcode
  if encrypted then title = title .. " (enciphered)" end
  tree:append_text(", " .. title)
  pinfo.cols.info = title
  if encrypted and (frame:len() - 2) % 8 ~= 0 then
    return drop("an enciphered body is a multiple of 8 bytes")
  end
  local clear = opened(frame, encrypted)
  if clear == nil then
    if frame:len() > 2 then tree:add(f.body, frame(2)) end
    return buffer:len()
  end
  if MINIMUM[opcode] == nil then return buffer:len() end
  if clear:len() < MINIMUM[opcode] then return drop("shorter than its fixed part") end
  local text = show[opcode](clear, tree)
  if text == nil then return drop("its fields do not fit together") end
  pinfo.cols.info = title .. ": " .. text
  return buffer:len()
end

-- Whether a datagram on some port looks like a frame: header, length and texts must all fit.
local function looks_like_a_frame(buffer)
  if buffer:len() < 6 then return false end
  local high, low = buffer(0, 1):uint(), buffer(1, 1):uint()
  local opcode = bit.rshift(low, 4)
  if MINIMUM[opcode] == nil or bit.band(high, 0x7e) ~= 0 then return false end
  if bit.band(high, 0x80) ~= 0 then return false end
  if buffer:len() < MINIMUM[opcode] then return false end
  if opcode == DATA then return buffer(2, 2):uint() == buffer:len() - 6 end
  if opcode == RRQ then return buffer:len() > 52 and buffer(2, 4):uint() == 0 end
  if opcode == ANNOUNCEMENT then
    return buffer(4, 2):uint() > 0 and text_length(buffer, 51) ~= nil
  end
  if buffer(2, 2):uint() ~= 0 then return false end
  return opcode == ERROR or buffer:len() == MINIMUM[opcode]
end

mcftp:register_heuristic("udp", function(buffer, pinfo, root)
  if not looks_like_a_frame(buffer) then return false end
  mcftp.dissector(buffer, pinfo, root)
  return true
end)

local udp_ports = DissectorTable.get("udp.port")
local registered_port

-- Called when the file has been read, and again whenever a preference changes.
local function register_port()
  if registered_port == mcftp.prefs.port then return end
  if registered_port ~= nil then udp_ports:remove(registered_port, mcftp) end
  registered_port = mcftp.prefs.port
  if registered_port > 0 then udp_ports:add(registered_port, mcftp) end
end
mcftp.prefs_changed = register_port
register_port()

-- Progress: from the client to a user interface, mostly on one machine ---------------------------

function status.dissector(buffer, pinfo, root)
  if buffer:len() < 12 then return 0 end
  pinfo.cols.protocol = "MCFTP progress"
  local tree = root:add(status, buffer())
  tree:add(s.percent, buffer(2, 2))
  tree:add(s.total, buffer(4, 4))
  tree:add(s.file_size, buffer(8, 4))
  local name = ""
  if buffer:len() > 12 then
    name = up_to_zero(buffer(12))
    tree:add(s.file_name, buffer(12), name)
  end
  pinfo.cols.info = string.format("%u%% of %s", buffer(2, 2):uint(), name)
  return buffer:len()
end

local function looks_like_progress(buffer)
  if buffer:len() < 14 or buffer(0, 2):uint() ~= 0x0100 then return false end
  if buffer(2, 2):uint() > 100 then return false end
  return text_length(buffer, 12) == buffer:len() - 12
end

status:register_heuristic("udp", function(buffer, pinfo, root)
  if not looks_like_progress(buffer) then return false end
  status.dissector(buffer, pinfo, root)
  return true
end)
udp_ports:add_for_decode_as(mcftp)
udp_ports:add_for_decode_as(status)
