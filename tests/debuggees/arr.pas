program arr;
var a: array[1..3] of integer;
begin
  a[1] := 1;
end.
