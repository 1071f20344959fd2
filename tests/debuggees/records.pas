{ A Pascal program with a record, an array and a procedure with arguments. }
program records;

type
  TPoint = record
    X, Y: LongInt;
  end;

var
  Origin: TPoint;
  Values: array[1..4] of LongInt;

procedure Shift(var Point: TPoint; Delta: LongInt);
begin
  Point.X := Point.X + Delta; { line:shift-body }
  Point.Y := Point.Y - Delta;
end;

begin
  Origin.X := 3;
  Origin.Y := 4;
  Values[1] := 10;
  Values[2] := 20;
  Values[3] := 30;
  Values[4] := 40;
  Write('shifting');
  Shift(Origin, 2);
  WriteLn(' done ', Origin.X, ' ', Origin.Y);
  Halt(3);
end.
