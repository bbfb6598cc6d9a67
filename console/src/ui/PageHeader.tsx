import { Title } from '@patternfly/react-core/dist/esm/components/Title';
import { useEffect, useRef, type ReactNode } from 'react';
import { takeFocusRequest } from '../shell/router';

interface PageHeaderProps {
  title: string;
  // One line below the title.
  description?: ReactNode;
  // Buttons at the end of the line.
  actions?: ReactNode;
}

// The heading of a view. Takes the focus when the view was navigated to, so that a screen reader begins there.
export function PageHeader({ title, description, actions }: PageHeaderProps) {
  const heading = useRef<HTMLDivElement>(null);
  useEffect(() => {
    if (takeFocusRequest()) heading.current?.querySelector('h1')?.focus({ preventScroll: true });
  }, []);
  return (
    <div className="vorn-header" ref={heading}>
      <div className="vorn-header__words">
        <Title headingLevel="h1" tabIndex={-1}>
          {title}
        </Title>
        {description !== undefined && <p className="vorn-header__description">{description}</p>}
      </div>
      {actions !== undefined && <div className="vorn-header__actions">{actions}</div>}
    </div>
  );
}
