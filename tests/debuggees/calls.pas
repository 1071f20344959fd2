program calls;
function Add(A, B: Integer): Integer;
begin
  Add := A + B;
end;
procedure Show;
begin
  WriteLn(Add(1, 2));
end;
procedure Bye;
begin
  WriteLn('bye');
end;
begin
  AddExitProc(@Bye);
  Show;
end.
