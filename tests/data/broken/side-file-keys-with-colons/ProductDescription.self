sourceInfo=
  startTime = 2010-05-01T10:20:30.000000Z;
=
note: first = one;
note = first: two;
note: second = three: four;
note: first = five;
